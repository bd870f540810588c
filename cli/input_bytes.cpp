#include "cli/input_bytes.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <limits>
#include <new>

namespace orvalis::cli {
namespace {

/// Pictures may stand before the audio; nothing sensible is longer.
constexpr std::int64_t kMaxHeadBytes = 64 << 20;

/// The length of a stream, as libsndfile sees it.
constexpr std::int64_t kEndless = std::numeric_limits<std::int64_t>::max();

}  // namespace

InputBytes::InputBytes(int descriptor, bool is_stream)
    : descriptor_(descriptor), is_stream_(is_stream) {
  if (!is_stream_) origin_ = std::max<std::int64_t>(0, lseek(descriptor_, 0, SEEK_CUR));
}

InputBytes::~InputBytes() { close(descriptor_); }

SF_VIRTUAL_IO *InputBytes::functions() {
  static constexpr auto of = [](void *self) -> InputBytes & {
    return *static_cast<InputBytes *>(self);
  };
  static SF_VIRTUAL_IO table{
      [](void *self) -> sf_count_t { return of(self).length().value_or(kEndless); },
      [](sf_count_t offset, int whence, void *self) { return of(self).seek(offset, whence); },
      [](void *to, sf_count_t count, void *self) -> sf_count_t {
        return of(self).read(static_cast<char *>(to), count);
      },
      nullptr, [](void *self) -> sf_count_t { return of(self).position_; }};
  return &table;
}

std::optional<std::int64_t> InputBytes::length() const {
  struct stat status;
  if (is_stream_ || fstat(descriptor_, &status) != 0) return std::nullopt;
  return std::max<std::int64_t>(0, status.st_size - origin_);
}

bool InputBytes::ends_before(std::int64_t position) const {
  return is_stream_ ? ended_ && received_ < position : length() < position;
}

bool InputBytes::read_at(std::int64_t position, std::span<char> to) {
  const auto count = static_cast<std::int64_t>(to.size());
  if (position < 0 || (is_stream_ && !receive_up_to(position))) return false;
  seek(position, SEEK_SET);
  return read(to.data(), count) == count;
}

void InputBytes::show(std::int64_t position, std::span<const char> bytes) {
  shown_at_ = position;
  shown_size_ = bytes.size();
  std::ranges::copy(bytes, shown_.begin());
}

std::int64_t InputBytes::seek(std::int64_t offset, int whence) {
  const std::int64_t end = length().value_or(kEndless);
  const std::int64_t base = whence == SEEK_SET ? 0 : whence == SEEK_CUR ? position_ : end;
  std::int64_t position;
  if (__builtin_add_overflow(base, offset, &position) || position < 0) return -1;
  return position_ = position;
}

std::int64_t InputBytes::read(char *to, std::int64_t count) {
  if (count <= 0) return 0;
  const std::int64_t from = position_;
  std::int64_t got = 0;
  if (is_stream_) {
    got = read_stream(to, count);
  } else if (lseek(descriptor_, origin_ + from, SEEK_SET) >= 0) {
    got = receive(to, count);
  }
  position_ += got;
  // libsndfile looks for chunks until it stands at the end, so what finds nothing has to be there.
  if (is_stream_ && opening_ && got == 0) position_ = kEndless;
  for (std::size_t i = 0; i < shown_size_; ++i) {
    const std::int64_t at = shown_at_ + static_cast<std::int64_t>(i) - from;
    if (at >= 0 && at < got) to[at] = shown_[i];
  }
  return got;
}

std::int64_t InputBytes::read_stream(char *to, std::int64_t count) {
  const auto kept = static_cast<std::int64_t>(head_.size());
  std::int64_t got = 0;
  if (position_ < kept) {
    got = std::min(count, kept - position_);
    std::copy_n(head_.begin() + position_, got, to);
    if (got == count) return got;
  }
  // While a file is opened, whoever looks behind the audio finds the end there.
  if (opening_ && position_ + got > received_) return got;
  if (!opening_ && !receive_up_to(position_ + got)) return got;
  if (position_ + got < received_) {
    if (error_ == 0) error_ = ESPIPE;
    return got;
  }
  return got + receive(to + got, count - got);
}

/// Reads on from where the descriptor stands: less than `count` at the end, or after an error.
std::int64_t InputBytes::receive(char *to, std::int64_t count) {
  if (is_stream_ && opening_) count = std::min(count, kMaxHeadBytes - received_);
  std::int64_t got = 0;
  while (error_ == 0 && got < count) {
    const ssize_t size = ::read(descriptor_, to + got, static_cast<std::size_t>(count - got));
    if (size < 0 && errno == EINTR) continue;
    if (size < 0) error_ = errno;
    if (size == 0) ended_ = true;
    if (size <= 0) break;
    got += size;
  }
  received_ += got;
  if (is_stream_ && opening_) try {
      head_.insert(head_.end(), to, to + got);
    } catch (const std::bad_alloc &) {
      error_ = ENOMEM;  // libsndfile cannot pass exceptions on
    }
  return got;
}

bool InputBytes::receive_up_to(std::int64_t position) {
  std::array<char, 4096> skipped;
  while (received_ < position) {
    const auto left = std::min<std::int64_t>(position - received_, std::ssize(skipped));
    if (receive(skipped.data(), left) < left) return false;
  }
  return true;
}

}  // namespace orvalis::cli
