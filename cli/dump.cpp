#include "cli/dump.h"

#include <fmt/format.h>
#include <orvalis.h>

#include <CLI/CLI.hpp>
#include <map>
#include <system_error>

#include "cli/audio_file.h"
#include "cli/options.h"

namespace orvalis::cli {
namespace {

namespace fs = std::filesystem;

constexpr const char *kSuffixes[] = {"_inputEPD.pcm", "_resultEPD.pcm"};

/// The first of take, take-2, take-3 ... under which there are no dump files yet.
fs::path free_name(const fs::path &wanted) {
  for (int number = 1;; ++number) {
    const fs::path name =
        number == 1 ? wanted : fs::path(fmt::format("{}-{}", wanted.string(), number));
    bool taken = false;
    for (const char *suffix : kSuffixes)
      taken = taken || fs::exists(fs::symlink_status(name.string() + suffix));
    if (!taken) return name;
  }
}

}  // namespace

Dump::Dump(const std::string &root) : folder_(fs::path(root) / "sdcard/VRpreprocess") {
  if (SetDumpRoot(root.c_str()) != 0)
    throw CLI::ValidationError("--dump", "the folder's name is too long");
  make_folder("--dump", folder_);
  for (const auto &entry : fs::directory_iterator(folder_)) before_.insert(entry.path());
}

void Dump::finish(const std::string &input, std::int64_t samples) const {
  // The engine names files after an address that only it knows.
  std::map<std::string, fs::path> found;
  for (const auto &entry : fs::directory_iterator(folder_))
    for (const std::string suffix : kSuffixes)
      if (!before_.contains(entry.path()) && entry.path().string().ends_with(suffix))
        found[suffix] = entry.path();
  const fs::path name = free_name(folder_ / file_name_of(input).stem());
  for (const std::string suffix : kSuffixes) {
    const auto file = found.find(suffix);
    if (file == found.end()) throw AudioError(folder_.string() + ": a dump file is missing");
    const fs::path final_name = name.string() + suffix;
    fs::rename(file->second, final_name);
    const auto expected = samples * std::int64_t{sizeof(std::int16_t)};
    if (const auto size = static_cast<std::int64_t>(fs::file_size(final_name)); size != expected)
      throw AudioError(fmt::format("{}: the dump is incomplete, {} bytes of {}: is the disk full?",
                                   final_name.string(), size, expected));
  }
}

}  // namespace orvalis::cli
