// Line-oriented parsers for the vector files; small and strict enough to fail loudly on a
// file that does not look as expected.
#include "support/vector_file.h"

#include <fstream>
#include <stdexcept>

namespace tessel::test {
namespace {

std::string trim(const std::string& s) {
  const auto b = s.find_first_not_of(" \t\r\n");
  if (b == std::string::npos) return "";
  const auto e = s.find_last_not_of(" \t\r\n");
  return s.substr(b, e - b + 1);
}

}  // namespace

const std::string& VectorRecord::at(const std::string& name) const {
  const auto it = fields.find(name);
  if (it == fields.end()) throw std::runtime_error("vector record has no field " + name);
  return it->second;
}

std::vector<VectorRecord> readVectorRecords(const std::string& path) {
  std::ifstream in(path);
  if (!in) throw std::runtime_error("cannot open " + path);
  std::vector<VectorRecord> records;
  std::string section, line;
  VectorRecord current;
  auto flush = [&] {
    if (!current.fields.empty()) records.push_back(current);
    current = VectorRecord{};
    current.section = section;
  };
  while (std::getline(in, line)) {
    line = trim(line);
    if (line.empty()) {
      flush();
    } else if (line[0] == '#') {
      continue;
    } else if (line[0] == '[') {
      flush();
      section = trim(line.substr(1, line.find(']') - 1));
      current.section = section;
    } else {
      const auto eq = line.find('=');
      if (eq == std::string::npos) continue;
      current.fields[trim(line.substr(0, eq))] = trim(line.substr(eq + 1));
    }
  }
  flush();
  return records;
}

}  // namespace tessel::test
