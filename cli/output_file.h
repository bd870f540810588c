// An audio file that appears complete or not at all, and never in place of an input.
#pragma once

#include <sys/types.h>

#include <map>
#include <mutex>
#include <optional>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "cli/audio_file.h"
#include "cli/temporary_file.h"

namespace orvalis::cli {

/// The inputs of a run and the files that it has written. No output may overwrite one of them under
/// any name: a link, another spelling, or standard output. Used by all threads.
class ProtectedFiles {
public:
  /// "-" is standard input.
  explicit ProtectedFiles(const std::vector<std::string> &inputs);

  /// What a file of that name, or standard output for "-", already is: "an input" or "another
  /// output"; null if it is none of these files.
  const char *role_of(const std::string &output) const;

  /// Gives `file` the name `path` and protects it from now on. Returns 0 or an errno. Throws
  /// AudioError if the name belongs to one of the files.
  int rename(TemporaryFile &file, const std::string &path, bool may_replace);

private:
  using Identity = std::pair<dev_t, ino_t>;

  const char *locked_role_of(const std::string &output) const;

  mutable std::mutex mutex_;
  std::map<Identity, const char *> roles_;
};

/// Throws AudioError if that output is one of the files.
void check_role(const ProtectedFiles *files, const std::string &output);

/// How a run writes its files.
struct OutputRules {
  bool may_replace = false;  ///< Files that exist, except protected ones
  bool sync = false;         ///< On the disk before they get their names
  ProtectedFiles *protected_files = nullptr;
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
  /// Throws if `rules` do not allow to replace `path`. Whether that exists is checked once more
  /// when committing.
  OutputFile(const std::string &path, const SampleFormat &format, const OutputRules &rules);
  ~OutputFile();

  /// Appends interleaved samples. What exceeds full scale clips, unless the format can hold it.
  void write(std::span<const short> samples);
  void write(std::span<const int> samples);
  void write(std::span<const float> samples);
  void write(std::span<const double> samples);

  /// Completes the file and gives it its name.
  void commit();

private:
  template <class Sample>
  void append(std::span<const Sample> samples,
              sf_count_t (*encode)(SNDFILE *, const Sample *, sf_count_t));
  [[noreturn]] void fail(int error) const;
  void check(bool good) const;

  std::string path_;
  OutputRules rules_;
  bool needs_samples_;  ///< There are none yet, and the format requires some
  std::optional<TemporaryFile> temporary_;
  std::optional<FileBytes> bytes_;  // outlives sndfile_, which writes to it while closing
  Sndfile sndfile_;
};

}  // namespace orvalis::cli
