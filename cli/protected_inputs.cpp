#include "cli/protected_inputs.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <optional>
#include <utility>

namespace orvalis::cli {
namespace {

using FileIdentity = std::pair<dev_t, ino_t>;

std::vector<FileIdentity> inputs;

/// Of a regular file; others hold nothing that could be destroyed.
std::optional<FileIdentity> identity_of(const std::string &name, int standard_stream) {
  struct stat status;
  if ((name == "-" ? fstat(standard_stream, &status) : stat(name.c_str(), &status)) != 0 ||
      !S_ISREG(status.st_mode))
    return std::nullopt;
  return FileIdentity{status.st_dev, status.st_ino};
}

}  // namespace

void protect_inputs(const std::vector<std::string> &names) {
  for (const std::string &name : names)
    if (const auto identity = identity_of(name, STDIN_FILENO)) inputs.push_back(*identity);
}

bool is_protected(const std::string &name) {
  const auto identity = identity_of(name, STDOUT_FILENO);
  return identity && std::ranges::count(inputs, *identity) > 0;
}

}  // namespace orvalis::cli
