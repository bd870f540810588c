#include "cli/output_file.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <optional>
#include <system_error>

namespace orvalis::cli {
namespace {

using Identity = std::pair<dev_t, ino_t>;

/// Of a regular file or a disk; other files hold nothing that could be destroyed.
std::optional<Identity> identity_of(const struct stat &status) {
  if (S_ISBLK(status.st_mode)) return Identity{status.st_rdev, 0};
  if (!S_ISREG(status.st_mode)) return std::nullopt;
  return Identity{status.st_dev, status.st_ino};
}

std::optional<Identity> identity_of(const std::string &name, int standard_stream) {
  struct stat status;
  if ((name == "-" ? fstat(standard_stream, &status) : stat(name.c_str(), &status)) != 0)
    return std::nullopt;
  return identity_of(status);
}

bool exists(const std::string &path) {
  std::error_code ignored;
  return std::filesystem::exists(std::filesystem::symlink_status(path, ignored));
}

/// Returns 0 or an errno.
int sync_folder_of(const std::string &path) {
  const std::string folder = std::filesystem::path(path).parent_path();
  const int descriptor =
      open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (descriptor < 0) return errno;
  const int error = fsync(descriptor) == 0 ? 0 : errno;
  close(descriptor);
  return error;
}

/// Whether libsndfile can write a file without samples that can be read again.
bool can_be_empty(int sndfile_format) {
  const int type = sndfile_format & SF_FORMAT_TYPEMASK;
  return type != SF_FORMAT_FLAC && type != SF_FORMAT_OGG;
}

std::string unfit(const SampleFormat &format) {
  if ((format.sndfile_format & SF_FORMAT_SUBMASK) == SF_FORMAT_OPUS)
    return fmt::format("Opus holds 8000, 12000, 16000, 24000 or 48000 Hz, not {} Hz",
                       format.rate_hz);
  return fmt::format("the format cannot hold {} Hz in {} channel{}", format.rate_hz,
                     format.channels, format.channels == 1 ? "" : "s");
}

}  // namespace

ProtectedFiles::ProtectedFiles(const std::vector<std::string> &inputs) {
  for (const std::string &name : inputs)
    if (const auto identity = identity_of(name, STDIN_FILENO)) roles_[*identity] = "an input";
}

const char *ProtectedFiles::role_of(const std::string &output) const {
  const std::lock_guard lock(mutex_);
  return locked_role_of(output);
}

const char *ProtectedFiles::locked_role_of(const std::string &output) const {
  const auto identity = identity_of(output, STDOUT_FILENO);
  const auto known = identity ? roles_.find(*identity) : roles_.end();
  return known == roles_.end() ? nullptr : known->second;
}

int ProtectedFiles::rename(TemporaryFile &file, const std::string &path, bool may_replace) {
  const std::lock_guard lock(mutex_);
  if (const char *role = locked_role_of(path)) throw AudioError(path + ": the file is " + role);
  struct stat status;
  if (fstat(file.descriptor(), &status) != 0) return errno;
  const int error = file.rename(may_replace);
  if (error == 0) roles_[{status.st_dev, status.st_ino}] = "another output";
  return error;
}

void check_role(const ProtectedFiles *files, const std::string &output) {
  const char *role = files == nullptr ? nullptr : files->role_of(output);
  if (role != nullptr) throw AudioError(output + ": the file is " + role);
}

OutputFile::OutputFile(const std::string &path, const SampleFormat &format,
                       const OutputRules &rules)
    : path_(path), rules_(rules), needs_samples_(!can_be_empty(format.sndfile_format)) {
  check_role(rules_.protected_files, path);
  if (!rules_.may_replace && exists(path)) fail(EEXIST);
  temporary_.emplace(path);
  bytes_.emplace(fcntl(temporary_->descriptor(), F_DUPFD_CLOEXEC, 0));
  SF_INFO info{};
  info.samplerate = format.rate_hz;
  info.channels = format.channels;
  info.format = format.sndfile_format;
  if (!sf_format_check(&info)) throw AudioError(path + ": " + unfit(format));
  {
    const auto lock = lock_opening();
    sndfile_.reset(sf_open_virtual(FileBytes::functions(), SFM_WRITE, &info, &*bytes_));
  }
  if (!sndfile_ && bytes_->error() == 0) throw AudioError(path + ": " + unfit(format));
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
  if (const int error = bytes_->error()) fail(error);
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
  bytes_->close();
  check(closed);
  if (rules_.sync && fsync(temporary_->descriptor()) != 0) fail(errno);
  const int error = rules_.protected_files == nullptr
                        ? temporary_->rename(rules_.may_replace)
                        : rules_.protected_files->rename(*temporary_, path_, rules_.may_replace);
  if (error != 0) fail(error);
  if (rules_.sync)
    if (const int failed = sync_folder_of(path_)) fail(failed);
}

}  // namespace orvalis::cli
