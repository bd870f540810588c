// An audio file that appears complete or not at all, and never in place of an input.
#pragma once

#include <sys/types.h>

#include <memory>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "cli/audio_file.h"

namespace orvalis::cli {

/// The inputs of a run. No output may overwrite one of them under any name: a link, another
/// spelling, or standard output.
class ProtectedFiles {
public:
  /// "-" is standard input.
  explicit ProtectedFiles(const std::vector<std::string> &inputs);

  /// Whether an output of that name, or standard output for "-", is one of the files.
  bool contains(const std::string &output) const;

private:
  std::vector<std::pair<dev_t, ino_t>> files_;
};

/// What an output may do to files that exist.
struct Overwriting {
  bool allowed = false;                             ///< It replaces them
  const ProtectedFiles *protected_files = nullptr;  ///< Except these, unless null
};

struct SampleFormat {
  int rate_hz;
  int channels;
  int sndfile_format;  ///< Such as SF_FORMAT_WAV | SF_FORMAT_PCM_16
};

/// Written under a temporary name in the same folder, and removed unless committed. All methods may
/// throw AudioError, with the file's name in the message.
class OutputFile {
public:
  /// Throws if `overwriting` does not allow to replace `path`. Whether that exists is checked once
  /// more when committing.
  OutputFile(const std::string &path, const SampleFormat &format, const Overwriting &overwriting);
  ~OutputFile();

  /// Appends interleaved samples. What exceeds full scale clips, unless the format can hold it.
  void write(std::span<const short> samples);
  void write(std::span<const int> samples);
  void write(std::span<const float> samples);
  void write(std::span<const double> samples);

  /// Completes the file and gives it its name.
  void commit();

private:
  class TemporaryFile;

  template <class Sample>
  void append(std::span<const Sample> samples,
              sf_count_t (*encode)(SNDFILE *, const Sample *, sf_count_t));
  [[noreturn]] void fail(int error) const;
  void check(bool good) const;

  std::string path_;
  bool may_replace_;
  bool needs_samples_;                        ///< There are none yet, and the format requires some
  std::unique_ptr<TemporaryFile> temporary_;  // outlives sndfile_, which writes to it while closing
  Sndfile sndfile_;
};

}  // namespace orvalis::cli
