// What the library takes from the host's libraries, libzevocore.so.6 and libzevocgi.so.6.

#pragma once

extern "C" {

// Deterministic, reversible encryption of short texts; the key is the host's own business. Write
// a NUL-terminated text of at most outSize bytes and return non-zero, or return 0 on failure.
int ZOCLCryptSzEncrypt(const char* plain, char* out, int outSize);
int ZOCLCryptSzDecrypt(const char* cipher, char* out, int outSize);

// Writes the address of the current web request's client as a NUL-terminated text of at most
// outSize bytes and returns 0; non-zero outside a request.
int ZevoCgiGetRemoteIP(char* out, int outSize);

}  // extern "C"
