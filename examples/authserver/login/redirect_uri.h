// Redirect URIs: where the server may send a browser with a code.

#pragma once

#include <string>

namespace authserver {

// Whether the presented URI is the one that the client registered, character by character (RFC
// 6749, section 3.1.2.3). The library drops a leading "https://" or "http://" when it registers a
// client. A stored URI without a scheme matches https, or http if its host is this machine. A
// change of the registration stores the scheme too, which then has to match. A private-use scheme
// of an app, such as com.example.app:/done, is always stored.
bool isRegistered(const std::string& presented, const std::string& stored);

// Whether the URI is https, or http on this machine, and ends after its host or port.
bool isOrigin(const std::string& uri);

// Whether a URI will match after it was registered.
bool isRegistrable(const std::string& uri);

// What the pages show of the URI: "album.example", or "com.example.app" for an app.
std::string destinationOf(const std::string& uri);

// The URI's origin, as a source in a Content-Security-Policy.
std::string policySourceOf(const std::string& uri);

}  // namespace authserver
