#include "Voice_Engine/platform/dump_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstring>

namespace orvalis {
namespace {

constexpr std::size_t kPathSize = 256;
constexpr std::size_t kMaxHandleLength = 20;
constexpr std::size_t kMaxSuffixLength = sizeof "_resultEPD.pcm" - 1;
constexpr std::size_t kRootSize =
    kPathSize - (sizeof kDumpFolder - 1) - kMaxHandleLength - kMaxSuffixLength;

constinit char root[kRootSize] = "";

}  // namespace

bool set_dump_root(const char *directory) {
  const std::size_t length = directory == nullptr ? 0 : std::strlen(directory);
  if (length >= kRootSize) return false;
  std::memcpy(root, directory == nullptr ? "" : directory, length + 1);
  return true;
}

std::FILE *open_dump(const char *folder, const void *handle, const char *suffix) {
  char path[kPathSize];
  std::snprintf(path, sizeof path, "%s%s%ld%s", root, folder, handle_number(handle), suffix);
  // As fopen(path, "ab") does, but never through a link that somebody has put there, and not left
  // open in a program that the host starts.
  const int file = open(path, O_WRONLY | O_APPEND | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0666);
  if (file < 0) return nullptr;
  std::FILE *stream = fdopen(file, "ab");
  if (stream == nullptr) close(file);
  return stream;
}

void write_dump(std::FILE *file, const std::int16_t *samples, int count) {
  if (file == nullptr) return;
  [[maybe_unused]] const std::size_t written =
      std::fwrite(samples, sizeof *samples, static_cast<std::size_t>(count), file);
}

void close_dump(std::FILE *file) {
  if (file != nullptr) std::fclose(file);
}

}  // namespace orvalis
