#include "cli/output_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <fmt/format.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <system_error>

#include "cli/protected_inputs.h"

namespace orvalis::cli {
namespace {

std::string message_of(int error) { return std::generic_category().message(error); }

bool exists(const std::string &path) {
  std::error_code ignored;
  return std::filesystem::exists(std::filesystem::symlink_status(path, ignored));
}

/// Renames, but never onto a file that is there already. Returns 0 or the reason why not.
int rename_to_new(const std::string &from, const std::string &to) {
  if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
  if (errno != EINVAL && errno != ENOSYS) return errno;
  // Some file systems cannot do both at once.
  if (exists(to)) return EEXIST;
  return std::rename(from.c_str(), to.c_str()) == 0 ? 0 : errno;
}

/// Whether libsndfile can write a file without a sample that can be read again.
bool can_be_empty(int format) {
  const int type = format & SF_FORMAT_TYPEMASK;
  return type != SF_FORMAT_FLAC && type != SF_FORMAT_OGG;
}

}  // namespace

/// The bytes under their temporary name. Keeps the reason of the first failure, which libsndfile
/// does not tell, and not at all when closing.
class OutputFile::Bytes {
public:
  explicit Bytes(const std::string &path) {
    const std::filesystem::path target(path);
    static std::atomic<unsigned> made{0};
    do {
      name_ = target.parent_path() /
              fmt::format(".{}.{}-{}.part", target.filename().string(), getpid(), made++);
      descriptor_ = open(name_.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    } while (descriptor_ < 0 && errno == EEXIST);
    if (descriptor_ < 0) throw OutputError(path + ": " + message_of(errno));
  }
  ~Bytes() {
    close();
    if (!name_.empty()) unlink(name_.c_str());
  }
  Bytes(const Bytes &) = delete;
  Bytes &operator=(const Bytes &) = delete;

  int error() const { return error_; }

  void close() {
    if (descriptor_ >= 0 && ::close(descriptor_) != 0) note_error();
    descriptor_ = -1;
  }

  /// Gives the file its final name.
  void rename(const std::string &path, bool replace) {
    if (!replace)
      error_ = rename_to_new(name_, path);
    else if (std::rename(name_.c_str(), path.c_str()) != 0)
      note_error();
    if (error_ == 0) name_.clear();
  }

  /// libsndfile's view of it.
  static SF_VIRTUAL_IO *functions() {
    static SF_VIRTUAL_IO table{
        [](void *self) { return of(self).length(); },
        [](sf_count_t offset, int whence, void *self) {
          return static_cast<sf_count_t>(lseek(of(self).descriptor_, offset, whence));
        },
        [](void *to, sf_count_t count, void *self) {
          return static_cast<sf_count_t>(
              read(of(self).descriptor_, to, static_cast<std::size_t>(count)));
        },
        [](const void *from, sf_count_t count, void *self) { return of(self).write(from, count); },
        [](void *self) {
          return static_cast<sf_count_t>(lseek(of(self).descriptor_, 0, SEEK_CUR));
        }};
    return &table;
  }

private:
  static Bytes &of(void *self) { return *static_cast<Bytes *>(self); }

  sf_count_t length() const {
    const off_t position = lseek(descriptor_, 0, SEEK_CUR);
    const off_t end = lseek(descriptor_, 0, SEEK_END);
    lseek(descriptor_, position, SEEK_SET);
    return end;
  }

  sf_count_t write(const void *from, sf_count_t count) {
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

  void note_error() {
    if (error_ == 0) error_ = errno;
  }

  std::string name_;
  int descriptor_ = -1;
  int error_ = 0;
};

OutputFile::OutputFile(const std::string &path, const OutputFormat &format, bool replace)
    : path_(path), replace_(replace), lacks_samples_(!can_be_empty(format.format)) {
  if (is_protected(path)) throw OutputError(path + ": the file is an input");
  if (!replace && exists(path)) fail(EEXIST);
  bytes_ = std::make_unique<Bytes>(path);
  SF_INFO info{};
  info.samplerate = format.rate_hz;
  info.channels = format.channels;
  info.format = format.format;
  if (!sf_format_check(&info))
    throw OutputError(path + ": such audio does not fit the file's format");
  {
    const auto lock = lock_opening();
    file_.reset(sf_open_virtual(Bytes::functions(), SFM_WRITE, &info, bytes_.get()));
  }
  check(file_ != nullptr);
  // Else what exceeds full scale wraps around.
  sf_command(file_.get(), SFC_SET_CLIPPING, nullptr, SF_TRUE);
}

OutputFile::~OutputFile() = default;

void OutputFile::fail(int error) const {
  throw OutputError(path_ + ": " +
                    (error == EEXIST ? "the file exists; --force replaces it" : message_of(error)));
}

/// Whatever libsndfile says, the bytes must have been written.
void OutputFile::check(bool good) const {
  if (bytes_->error() != 0) fail(bytes_->error());
  if (!good) throw OutputError(path_ + ": the audio could not be encoded");
}

template <class Sample>
void OutputFile::append(std::span<const Sample> samples,
                        sf_count_t (*encode)(SNDFILE *, const Sample *, sf_count_t)) {
  const auto count = static_cast<sf_count_t>(samples.size());
  if (count > 0) lacks_samples_ = false;
  check(encode(file_.get(), samples.data(), count) == count);
}

void OutputFile::write(std::span<const short> samples) { append(samples, sf_write_short); }
void OutputFile::write(std::span<const int> samples) { append(samples, sf_write_int); }
void OutputFile::write(std::span<const float> samples) { append(samples, sf_write_float); }
void OutputFile::write(std::span<const double> samples) { append(samples, sf_write_double); }

void OutputFile::commit() {
  if (lacks_samples_) throw OutputError(path_ + ": the format cannot hold audio without a sample");
  // Encoders and headers are finished by closing.
  const bool closed = sf_close(file_.release()) == 0;
  bytes_->close();
  check(closed);
  bytes_->rename(path_, replace_);
  check(true);
}

}  // namespace orvalis::cli
