// Line-oriented parsers for the vector files; small and strict enough to fail loudly on a
// file that does not look as expected.
#include "support/vector_file.h"

#include <cctype>
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

std::ifstream open(const std::string& path) {
  std::ifstream in(path);
  if (!in) throw std::runtime_error("cannot open " + path);
  return in;
}

}  // namespace

const std::string& VectorRecord::at(const std::string& name) const {
  const auto it = fields.find(name);
  if (it == fields.end()) throw std::runtime_error("vector record has no field " + name);
  return it->second;
}

std::vector<VectorRecord> readVectorRecords(const std::string& path) {
  std::ifstream in = open(path);
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

std::vector<Pkcs1Example> readPkcs1Examples(const std::string& path) {
  // Hex values follow "# Name:" headers and end at a blank or comment line; each example's
  // ciphertext ("# Encryption:") comes last, after the modulus of its key and its message and seed.
  static const std::string kExample = "# PKCS#1 v1.5 Encryption Example ";
  std::ifstream in = open(path);
  std::vector<Pkcs1Example> examples;
  std::map<std::string, std::string> hex;
  std::string line, field, name;
  while (std::getline(in, line)) {
    const std::string t = trim(line);
    if (!t.empty() && t[0] != '#' && t[0] != '=') {
      for (char c : t)
        if (c != ' ' && !field.empty()) hex[field] += c;
      continue;
    }
    if (field == "Encryption") {
      std::string modulus = hex["Modulus"];
      for (auto& c : modulus) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
      examples.push_back({name, modulus, fromHex(hex["Message"]), fromHex(hex["Seed"]), fromHex(hex["Encryption"])});
    }
    field.clear();
    if (t.rfind(kExample, 0) == 0) name = t.substr(kExample.size());
    if (t.size() > 3 && t[0] == '#' && t.back() == ':') hex[field = t.substr(2, t.size() - 3)].clear();
  }
  return examples;
}

}  // namespace tessel::test
