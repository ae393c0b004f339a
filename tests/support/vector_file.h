// Readers for the published vector files under tests/data (see tests/data/SOURCES.md).
#pragma once

#include <map>
#include <string>
#include <vector>

#include "support/openssl_oracle.h"

namespace tessel::test {

// One "NAME = value" record of a NIST .rsp-style file. `section` is the last bracketed header
// seen before it ("ENCRYPT", "DECRYPT", "L = 20", ...).
struct VectorRecord {
  std::string section;
  std::map<std::string, std::string> fields;
  const std::string& at(const std::string& name) const;  // throws when missing
  bool has(const std::string& name) const { return fields.count(name) != 0; }
};

// Records are separated by blank lines; "#" lines are comments. Throws if the file is missing.
std::vector<VectorRecord> readVectorRecords(const std::string& path);

}  // namespace tessel::test
