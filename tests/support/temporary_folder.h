// A folder that vanishes with the test.
#pragma once

#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <string>

namespace orvalis::test {

class TemporaryFolder {
public:
  TemporaryFolder() {
    std::string name = std::filesystem::temp_directory_path() / "orvalis-XXXXXX";
    if (!mkdtemp(name.data())) throw std::runtime_error("no temporary folder");
    path_ = name;
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryFolder(const TemporaryFolder &) = delete;
  TemporaryFolder &operator=(const TemporaryFolder &) = delete;

  std::string operator/(const std::string &name) const { return path_ / name; }
  const std::filesystem::path &path() const { return path_; }

private:
  std::filesystem::path path_;
};

}  // namespace orvalis::test
