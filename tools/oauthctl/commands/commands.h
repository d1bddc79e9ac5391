// The functions behind the table of commands.

#pragma once

#include "terminal/invocation.h"

namespace oauthctl {

// From this percentage of its ceiling on, showStatus() warns about a table.
inline constexpr int kWarnFrom = 80;

void showStatus(const Invocation& invocation);
void checkSoundness(const Invocation& invocation);
void backUp(const Invocation& invocation);
void restore(const Invocation& invocation);

void listClients(const Invocation& invocation);
void showClient(const Invocation& invocation);
void addClient(const Invocation& invocation);
void editClient(const Invocation& invocation);
void enableClient(const Invocation& invocation);
void disableClient(const Invocation& invocation);
void deleteClient(const Invocation& invocation);

void listCodes(const Invocation& invocation);
void revokeCodes(const Invocation& invocation);
void purgeCodes(const Invocation& invocation);

void listTokens(const Invocation& invocation);
void showToken(const Invocation& invocation);
void verifyToken(const Invocation& invocation);
void revokeTokens(const Invocation& invocation);
void purgeTokens(const Invocation& invocation);

void showLog(const Invocation& invocation);
void clearLog(const Invocation& invocation);

}  // namespace oauthctl
