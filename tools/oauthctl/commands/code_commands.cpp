#include "commands.h"
#include "grants.h"

namespace oauthctl {

void listCodes(const Invocation& invocation) { listGrants(kCodes, invocation); }

// By deleting: the library's own Revoke() only makes a code expire, from the next second on.
void revokeCodes(const Invocation& invocation) { revokeGrants(kCodes, invocation); }

void purgeCodes(const Invocation& invocation) { purgeGrants(kCodes, invocation); }

}  // namespace oauthctl
