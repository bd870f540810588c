#include "cli/audio_file.h"

#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace orvalis::cli {

std::unique_lock<std::mutex> lock_opening() {
  static std::mutex opening;
  return std::unique_lock(opening);
}

std::filesystem::path file_name_of(const std::string &input) {
  return input == "-" ? "stdin" : std::filesystem::path(input).filename();
}

std::string message_of(int error) { return std::generic_category().message(error); }

SF_VIRTUAL_IO *FileBytes::functions() {
  static constexpr auto of = [](void *self) -> FileBytes & {
    return *static_cast<FileBytes *>(self);
  };
  static SF_VIRTUAL_IO table{
      [](void *self) { return of(self).length(); },
      [](sf_count_t offset, int whence, void *self) { return of(self).seek(offset, whence); },
      nullptr,
      [](const void *from, sf_count_t count, void *self) { return of(self).write(from, count); },
      [](void *self) { return of(self).seek(0, SEEK_CUR); }};
  return &table;
}

void FileBytes::close() {
  if (descriptor_ >= 0 && ::close(descriptor_) != 0) note_error();
  descriptor_ = -1;
}

sf_count_t FileBytes::length() const {
  const sf_count_t position = seek(0, SEEK_CUR);
  const sf_count_t end = seek(0, SEEK_END);
  seek(position, SEEK_SET);
  return end;
}

sf_count_t FileBytes::seek(sf_count_t offset, int whence) const {
  return lseek(descriptor_, offset, whence);
}

sf_count_t FileBytes::write(const void *from, sf_count_t count) {
  const auto *bytes = static_cast<const char *>(from);
  for (sf_count_t left = count; left > 0;) {
    const ssize_t written = ::write(descriptor_, bytes, static_cast<std::size_t>(left));
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) {
      note_error();
      return count - left;
    }
    bytes += written;
    left -= written;
  }
  return count;
}

void FileBytes::note_error() {
  if (error_ == 0) error_ = errno;
}

}  // namespace orvalis::cli
