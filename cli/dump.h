// The engine's dump files, which get the name of their input once they are complete.
#pragma once

#include <cstdint>
#include <filesystem>
#include <set>
#include <string>

namespace orvalis::cli {

class Dump {
public:
  /// From now on the detector dumps below this folder, which is created if necessary. Takes one
  /// input. Throws CLI::ValidationError or std::runtime_error.
  explicit Dump(const std::string &root);

  /// After the detector has been closed: each of both files must hold that many samples. Throws
  /// AudioError if it does not, for the engine itself reports no full disk.
  void finish(const std::string &input, std::int64_t samples) const;

private:
  std::filesystem::path folder_;
  std::set<std::filesystem::path> before_;  ///< What other runs have left
};

}  // namespace orvalis::cli
