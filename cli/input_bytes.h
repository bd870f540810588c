// The bytes of an input, file or stream, as libsndfile reads them.
#pragma once

#include <sndfile.h>

#include <array>
#include <cstdint>
#include <optional>
#include <span>
#include <vector>

namespace orvalis::cli {

/// Retries what a signal interrupts, and keeps the first error, after which nothing more is read:
/// libsndfile takes an error for the end. Of a stream it keeps what is read while a file is opened,
/// because libsndfile, which believes that it can seek, reads that twice.
class InputBytes {
public:
  /// Owns `descriptor`. Positions count from where it stands.
  InputBytes(int descriptor, bool is_stream);
  ~InputBytes();
  InputBytes(const InputBytes &) = delete;
  InputBytes &operator=(const InputBytes &) = delete;

  /// The first errno, or 0.
  int error() const { return error_; }

  /// Unknown for a stream.
  std::optional<std::int64_t> length() const;

  /// Whether the end is known to come before `position`.
  bool ends_before(std::int64_t position) const;

  /// Fills `to`, or returns false. Waits for a stream to get there, within reason.
  bool read_at(std::int64_t position, std::span<char> to);

  /// What libsndfile shall read at `position`, instead of what is there.
  void show(std::int64_t position, std::span<const char> bytes);

  /// Back to the beginning.
  void rewind() { position_ = 0; }

  /// From now on a stream is read once.
  void end_opening() { opening_ = false; }

  /// To be passed to libsndfile together with an InputBytes.
  static SF_VIRTUAL_IO *functions();

private:
  std::int64_t seek(std::int64_t offset, int whence);
  std::int64_t read(char *to, std::int64_t count);
  std::int64_t read_stream(char *to, std::int64_t count);
  std::int64_t receive(char *to, std::int64_t count);
  bool receive_up_to(std::int64_t position);

  int descriptor_;
  int error_ = 0;
  bool is_stream_;
  bool opening_ = true;
  bool ended_ = false;
  std::int64_t origin_ = 0, position_ = 0, received_ = 0;
  std::vector<char> head_;  ///< Of a stream
  std::int64_t shown_at_ = 0;
  std::array<char, 8> shown_{};
  std::size_t shown_size_ = 0;
};

}  // namespace orvalis::cli
