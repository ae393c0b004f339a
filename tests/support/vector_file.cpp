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
  std::ifstream in = open(path);
  std::vector<Pkcs1Example> examples;
  std::string line, modulus;
  std::string* collecting = nullptr;
  std::string message, seed, cipher;
  int keyNumber = 0, exampleNumber = 0;
  bool modulusDone = false;
  auto finish = [&] {
    if (!cipher.empty()) {
      examples.push_back({std::to_string(keyNumber) + "." + std::to_string(exampleNumber), modulus,
                          fromHex(message), fromHex(seed), fromHex(cipher)});
    }
    message.clear();
    seed.clear();
    cipher.clear();
  };
  while (std::getline(in, line)) {
    const std::string t = trim(line);
    if (t.rfind("# Example ", 0) == 0) {
      finish();
      keyNumber = std::stoi(t.substr(10));
      exampleNumber = 0;
      modulus.clear();
      modulusDone = false;
      collecting = nullptr;
    } else if (t.rfind("# PKCS#1 v1.5 Encryption Example", 0) == 0 ||
               (t.rfind("# PKCS#1 v1.5 encryption of", 0) == 0)) {
      finish();
      collecting = nullptr;
    } else if (t == "# Modulus:") {
      collecting = modulusDone ? nullptr : &modulus;
      modulusDone = true;
    } else if (t == "# Message:") {
      ++exampleNumber;
      collecting = &message;
    } else if (t == "# Seed:") {
      collecting = &seed;
    } else if (t == "# Encryption:") {
      collecting = &cipher;
    } else if (t.empty() || t[0] == '#' || t[0] == '=') {
      collecting = nullptr;
    } else if (collecting != nullptr) {
      for (char c : t)
        if (c != ' ') *collecting += c;
    }
  }
  finish();
  for (auto& e : examples)
    for (auto& c : e.modulusHex)
      if (c >= 'a' && c <= 'f') c = static_cast<char>(c - 'a' + 'A');
  return examples;
}

}  // namespace tessel::test
