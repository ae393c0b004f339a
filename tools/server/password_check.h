// Whether an opened output was made from the password the bank stores.
//
// Salted hash of types 47, 48, 55, 59: MD5 hex (lower case) of the password, then MD5 hex of
// that followed by the salt; mode 'S' keeps characters 8..23, 'F' all 32.
#pragma once

#include <string>

#include "server/tessel_opener.h"

namespace tessel::server {

// The salted-hash value; empty for a mode other than 'S' and 'F'.
std::string saltedHashValue(const std::string& password, const std::string& salt, char mode);

// Hashed types (47, 48, 55, 59): with a salt, the salted-hash value (mode 'S' or 'F'); with an
// empty salt (the app set none), the password itself. Type 5: the SHA-1 of the password. Other
// types: the opened text itself. False when the content was not opened. The comparison is
// constant-time; a caller answers a false exactly as it answers a refused output.
bool matchesPassword(int type, const Opened& opened, const std::string& password, const std::string& salt,
                     char mode);

}  // namespace tessel::server
