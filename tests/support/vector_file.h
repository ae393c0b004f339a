// Reader for the published vector files under tests/data (see tests/data/SOURCES.md): strict
// enough to fail loudly on a file that does not look as expected.
#pragma once

#include <fstream>
#include <map>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/openssl_oracle.h"

namespace tessel::test {

// One "NAME = value" record of a NIST .rsp-style file. `section` is the last bracketed header
// seen before it ("ENCRYPT", "DECRYPT", "L = 20", ...).
struct VectorRecord {
  std::string section;
  std::map<std::string, std::string> fields;
  const std::string& at(const std::string& name) const {
    const auto it = fields.find(name);
    if (it == fields.end()) throw std::runtime_error("vector record has no field " + name);
    return it->second;
  }
  bool has(const std::string& name) const { return fields.count(name) != 0; }
};

// Records are separated by blank lines or section headers; "#" lines are comments.
inline std::vector<VectorRecord> readVectorRecords(const std::string& path) {
  std::ifstream in(path);
  if (!in) throw std::runtime_error("cannot open " + path);
  const auto trim = [](const std::string& s) {
    const auto b = s.find_first_not_of(" \t\r\n");
    return b == std::string::npos ? std::string() : s.substr(b, s.find_last_not_of(" \t\r\n") - b + 1);
  };
  std::vector<VectorRecord> records(1);
  for (std::string line; std::getline(in, line);) {
    line = trim(line);
    const auto eq = line.find('=');
    if ((line.empty() || line[0] == '[') && !records.back().fields.empty()) records.push_back({records.back().section, {}});
    if (!line.empty() && line[0] == '[') {
      records.back().section = trim(line.substr(1, line.find(']') - 1));
    } else if (!line.empty() && line[0] != '#' && eq != std::string::npos) {
      records.back().fields[trim(line.substr(0, eq))] = trim(line.substr(eq + 1));
    }
  }
  if (records.back().fields.empty()) records.pop_back();
  return records;
}

}  // namespace tessel::test
