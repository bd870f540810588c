#include "cli/output_file.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <optional>
#include <system_error>

namespace orvalis::cli {
namespace {

/// Of a regular file; other files hold nothing that could be destroyed.
std::optional<std::pair<dev_t, ino_t>> identity_of(const std::string &name, int standard_stream) {
  struct stat status;
  if ((name == "-" ? fstat(standard_stream, &status) : stat(name.c_str(), &status)) != 0 ||
      !S_ISREG(status.st_mode))
    return std::nullopt;
  return std::pair{status.st_dev, status.st_ino};
}

bool exists(const std::string &path) {
  std::error_code ignored;
  return std::filesystem::exists(std::filesystem::symlink_status(path, ignored));
}

/// Renames, but never onto an existing file. Returns 0 or an errno.
int rename_to_new(const std::string &from, const std::string &to) {
  if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
  if (errno != EINVAL && errno != ENOSYS) return errno;
  // Some file systems cannot check and rename in one step.
  if (exists(to)) return EEXIST;
  return std::rename(from.c_str(), to.c_str()) == 0 ? 0 : errno;
}

/// Whether libsndfile can write a file without samples that can be read again.
bool can_be_empty(int sndfile_format) {
  const int type = sndfile_format & SF_FORMAT_TYPEMASK;
  return type != SF_FORMAT_FLAC && type != SF_FORMAT_OGG;
}

}  // namespace

ProtectedFiles::ProtectedFiles(const std::vector<std::string> &inputs) {
  for (const std::string &name : inputs)
    if (const auto identity = identity_of(name, STDIN_FILENO)) files_.push_back(*identity);
}

bool ProtectedFiles::contains(const std::string &output) const {
  const auto identity = identity_of(output, STDOUT_FILENO);
  return identity && std::ranges::count(files_, *identity) > 0;
}

/// Deleted unless it is renamed.
class OutputFile::TemporaryFile {
public:
  /// In the folder of `path`. Throws AudioError.
  explicit TemporaryFile(const std::string &path) : bytes_(create(path)) {}
  ~TemporaryFile() {
    if (!name_.empty()) unlink(name_.c_str());
  }
  TemporaryFile(const TemporaryFile &) = delete;
  TemporaryFile &operator=(const TemporaryFile &) = delete;

  FileBytes &bytes() { return bytes_; }

  /// Returns 0 or an errno.
  int rename(const std::string &path, bool may_replace) {
    const int error = may_replace ? std::rename(name_.c_str(), path.c_str()) == 0 ? 0 : errno
                                  : rename_to_new(name_, path);
    if (error == 0) name_.clear();
    return error;
  }

private:
  int create(const std::string &path) {
    static std::atomic<unsigned> count{0};
    const std::filesystem::path target(path);
    int descriptor;
    do {
      name_ = target.parent_path() /
              fmt::format(".{}.{}-{}.part", target.filename().string(), getpid(), count++);
      descriptor = open(name_.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    } while (descriptor < 0 && errno == EEXIST);
    if (descriptor < 0) throw AudioError(path + ": " + message_of(errno));
    return descriptor;
  }

  std::string name_;  // before bytes_, which is made together with it
  FileBytes bytes_;
};

OutputFile::OutputFile(const std::string &path, const SampleFormat &format,
                       const Overwriting &overwriting)
    : path_(path),
      may_replace_(overwriting.allowed),
      needs_samples_(!can_be_empty(format.sndfile_format)) {
  if (overwriting.protected_files != nullptr && overwriting.protected_files->contains(path))
    throw AudioError(path + ": the file is an input");
  if (!may_replace_ && exists(path)) fail(EEXIST);
  temporary_ = std::make_unique<TemporaryFile>(path);
  SF_INFO info{};
  info.samplerate = format.rate_hz;
  info.channels = format.channels;
  info.format = format.sndfile_format;
  if (!sf_format_check(&info))
    throw AudioError(path + ": such audio does not fit the file's format");
  {
    const auto lock = lock_opening();
    sndfile_.reset(sf_open_virtual(FileBytes::functions(), SFM_WRITE, &info, &temporary_->bytes()));
  }
  check(sndfile_ != nullptr);
  // Without this, samples beyond full scale wrap around.
  sf_command(sndfile_.get(), SFC_SET_CLIPPING, nullptr, SF_TRUE);
}

OutputFile::~OutputFile() = default;

void OutputFile::fail(int error) const {
  throw AudioError(path_ + ": " +
                   (error == EEXIST ? "the file exists; --force replaces it" : message_of(error)));
}

/// Whatever libsndfile returns, the bytes must have been written.
void OutputFile::check(bool good) const {
  if (const int error = temporary_->bytes().error()) fail(error);
  if (!good) throw AudioError(path_ + ": the audio could not be encoded");
}

template <class Sample>
void OutputFile::append(std::span<const Sample> samples,
                        sf_count_t (*encode)(SNDFILE *, const Sample *, sf_count_t)) {
  const auto count = static_cast<sf_count_t>(samples.size());
  if (count > 0) needs_samples_ = false;
  check(encode(sndfile_.get(), samples.data(), count) == count);
}

void OutputFile::write(std::span<const short> samples) { append(samples, sf_write_short); }
void OutputFile::write(std::span<const int> samples) { append(samples, sf_write_int); }
void OutputFile::write(std::span<const float> samples) { append(samples, sf_write_float); }
void OutputFile::write(std::span<const double> samples) { append(samples, sf_write_double); }

void OutputFile::commit() {
  if (needs_samples_) throw AudioError(path_ + ": the format cannot hold audio without a sample");
  // Closing completes the header, and what an encoder still holds.
  const bool closed = sf_close(sndfile_.release()) == 0;
  temporary_->bytes().close();
  check(closed);
  if (const int error = temporary_->rename(path_, may_replace_)) fail(error);
}

}  // namespace orvalis::cli
