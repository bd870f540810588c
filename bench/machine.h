// What a table was measured on.
#pragma once

#include <fstream>
#include <string>

namespace orvalis::bench {

inline std::string processor() {
  std::ifstream info("/proc/cpuinfo");
  for (std::string line; std::getline(info, line);) {
    if (line.starts_with("model name")) return line.substr(line.find(": ") + 2);
  }
  return "unknown processor";
}

inline std::string machine() {
#ifdef __clang__
  return processor() + ", Clang " __clang_version__;
#else
  return processor() + ", GCC " __VERSION__;
#endif
}

}  // namespace orvalis::bench
