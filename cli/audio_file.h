// What reading and writing audio files with libsndfile have in common.
#pragma once

#include <sndfile.h>

#include <filesystem>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <string>

namespace orvalis::cli {

/// A fault of one input or of its output; other inputs can still be processed.
class AudioError : public std::runtime_error {
public:
  using std::runtime_error::runtime_error;
};

struct SndfileCloser {
  void operator()(SNDFILE *file) const { sf_close(file); }
};
using Sndfile = std::unique_ptr<SNDFILE, SndfileCloser>;

/// libsndfile stores the reason why a file could not be opened in one place for all threads. Hold
/// this lock from opening a file until the reason has been read.
std::unique_lock<std::mutex> lock_opening();

/// The name of an input without its folder, for outputs that are named after it: "stdin" for "-".
std::filesystem::path file_name_of(const std::string &input);

/// The system's text for a value of errno.
std::string message_of(int error);

/// The bytes of a file that libsndfile writes. Keeps the first error: libsndfile does not report
/// its reason, and ignores errors while closing.
class FileBytes {
public:
  /// Owns `descriptor`.
  explicit FileBytes(int descriptor) : descriptor_(descriptor) {}
  ~FileBytes() { close(); }
  FileBytes(const FileBytes &) = delete;
  FileBytes &operator=(const FileBytes &) = delete;

  /// The first errno, or 0.
  int error() const { return error_; }

  void close();

  /// To be passed to libsndfile together with a FileBytes.
  static SF_VIRTUAL_IO *functions();

private:
  sf_count_t length() const;
  sf_count_t seek(sf_count_t offset, int whence) const;
  sf_count_t write(const void *from, sf_count_t count);
  void note_error();

  int descriptor_;
  int error_ = 0;
};

}  // namespace orvalis::cli
