// An audio file that is there whole or not at all.
#pragma once

#include <sndfile.h>

#include <memory>
#include <span>
#include <stdexcept>
#include <string>

#include "cli/open_audio.h"

namespace orvalis::cli {

/// What keeps a file from being written; the message names the file.
class OutputError : public std::runtime_error {
public:
  using std::runtime_error::runtime_error;
};

struct OutputFormat {
  int rate_hz;
  int channels;
  int format;  ///< One of libsndfile's, such as SF_FORMAT_WAV | SF_FORMAT_PCM_16
};

/// Is written under a temporary name in the folder of its own one, which it takes when it is
/// committed. Without that it vanishes. Every method may throw OutputError.
class OutputFile {
public:
  /// `replace`: a file of that name gives way, unless it is an input. Otherwise it is refused, now
  /// and when committing.
  OutputFile(const std::string &path, const OutputFormat &format, bool replace);
  ~OutputFile();

  /// Appends interleaved samples. What exceeds full scale clips, where the file's format ends
  /// there.
  void write(std::span<const short> samples);
  void write(std::span<const int> samples);
  void write(std::span<const float> samples);
  void write(std::span<const double> samples);

  /// Gives the complete file its name.
  void commit();

private:
  class Bytes;

  template <class Sample>
  void append(std::span<const Sample> samples,
              sf_count_t (*encode)(SNDFILE *, const Sample *, sf_count_t));
  [[noreturn]] void fail(int error) const;
  void check(bool good) const;

  std::string path_;
  bool replace_;
  bool lacks_samples_;            // and its format cannot be without
  std::unique_ptr<Bytes> bytes_;  // outlives file_, which writes to it while closing
  SndfilePointer file_;
};

}  // namespace orvalis::cli
