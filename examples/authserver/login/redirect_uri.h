// Where a browser may be sent with a code.

#pragma once

#include <string>

namespace authserver {

// Whether the client's registration covers the presented URI, to the letter (RFC 6749, section
// 3.1.2.3). Registering drops a leading "https://" or "http://", so that this settles what it
// stands for: https, or http where the host is this very machine. Changing a registration keeps the
// scheme, which then has to match too. A private-use scheme of an app, such as
// com.example.app:/done, was stored whole.
bool isRegistered(const std::string& presented, const std::string& stored);

// Whether it is https, or http on this machine, with a host, perhaps a port, and nothing more.
bool isOrigin(const std::string& uri);

// Whether a URI can be registered so that it will match later.
bool isRegistrable(const std::string& uri);

// What a person is shown: "album.example", or "com.example.app" for an app.
std::string destinationOf(const std::string& uri);

// The URI's origin as a source of a Content-Security-Policy.
std::string policySourceOf(const std::string& uri);

}  // namespace authserver
