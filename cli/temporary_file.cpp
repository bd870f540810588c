#include "cli/temporary_file.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <mutex>
#include <set>
#include <system_error>

#include "cli/audio_file.h"

namespace orvalis::cli {
namespace {

namespace fs = std::filesystem;

/// The names of all files that would have to be removed now. Never destroyed: a signal may come
/// while the process ends.
struct Unfinished {
  std::mutex mutex;
  std::set<std::string> names;
};

Unfinished &unfinished() {
  static auto &all = *new Unfinished;
  return all;
}

/// FNV-1a. The target's own name might leave no room for more.
std::uint64_t hash_of(const std::string &text) {
  std::uint64_t hash = 0xcbf29ce484222325;
  for (const unsigned char c : text) hash = (hash ^ c) * 0x100000001b3;
  return hash;
}

constexpr const char *kName = ".orvalis-{:016x}-{}-{}.part";

/// Whether a file's name is of the form above.
bool is_temporary_name(const std::string &name) {
  int length = 0;
  std::sscanf(name.c_str(), ".orvalis-%*16[0-9a-f]-%*10[0-9]-%*10[0-9].part%n", &length);
  constexpr std::size_t kHash = 9, kAfterHash = kHash + 16;
  return length == std::ssize(name) && name.find('-', kHash) == kAfterHash;
}

/// Renames, but never onto an existing file. Returns 0 or an errno.
int rename_to_new(const std::string &from, const std::string &to) {
  if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
  if (errno != EINVAL && errno != ENOSYS) return errno;
  // Some file systems cannot check and rename in one step.
  std::error_code ignored;
  if (fs::exists(fs::symlink_status(to, ignored))) return EEXIST;
  return std::rename(from.c_str(), to.c_str()) == 0 ? 0 : errno;
}

/// Best effort: only a privileged user may give files away.
void copy_rights(const struct stat &of, int descriptor) {
  if (fchown(descriptor, of.st_uid, of.st_gid) != 0 &&
      fchown(descriptor, static_cast<uid_t>(-1), of.st_gid) != 0) {
  }
  fchmod(descriptor, of.st_mode & 0777);
}

}  // namespace

TemporaryFile::TemporaryFile(const std::string &target) : target_(target) {
  while (!create()) {
  }
}

/// False if the name is taken, or the file was removed before it was locked.
bool TemporaryFile::create() {
  static std::atomic<unsigned> count{0};
  const fs::path path(target_);
  name_ = path.parent_path() / fmt::format(kName, hash_of(path.filename()), getpid(), count++);
  Unfinished &all = unfinished();
  const std::lock_guard lock(all.mutex);
  // What it replaces may be private, so it becomes readable for others only with its name.
  struct stat replaced;
  const bool is_private = stat(target_.c_str(), &replaced) == 0;
  descriptor_ =
      open(name_.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, is_private ? 0600 : 0666);
  if (descriptor_ < 0 && errno == EEXIST) return false;
  if (descriptor_ < 0) throw AudioError(target_ + ": " + message_of(errno));
  // File systems without locks also keep others from taking one, and thus from removing the file.
  flock(descriptor_, LOCK_EX);
  struct stat status;
  if (fstat(descriptor_, &status) == 0 && status.st_nlink == 0) {
    close(descriptor_);
    return false;
  }
  all.names.insert(name_);
  return true;
}

TemporaryFile::~TemporaryFile() {
  Unfinished &all = unfinished();
  const std::lock_guard lock(all.mutex);
  if (!name_.empty()) unlink(name_.c_str());
  all.names.erase(name_);
  close(descriptor_);
}

int TemporaryFile::rename(bool may_replace) {
  Unfinished &all = unfinished();
  const std::lock_guard lock(all.mutex);
  struct stat replaced;
  if (may_replace && stat(target_.c_str(), &replaced) == 0 && S_ISREG(replaced.st_mode))
    copy_rights(replaced, descriptor_);
  const int error = may_replace ? std::rename(name_.c_str(), target_.c_str()) == 0 ? 0 : errno
                                : rename_to_new(name_, target_);
  if (error == 0) {
    all.names.erase(name_);
    name_.clear();
  }
  return error;
}

void TemporaryFile::remove_all() {
  Unfinished &all = unfinished();
  all.mutex.lock();  // for good
  for (const std::string &name : all.names) unlink(name.c_str());
}

void remove_leftovers(const std::string &folder) {
  std::error_code error;
  for (fs::directory_iterator entry(folder.empty() ? "." : folder, error), end;
       !error && entry != end; entry.increment(error)) {
    if (!is_temporary_name(entry->path().filename())) continue;
    const int descriptor =
        open(entry->path().c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    if (descriptor < 0) continue;
    struct stat status;
    if (fstat(descriptor, &status) == 0 && S_ISREG(status.st_mode) &&
        flock(descriptor, LOCK_EX | LOCK_NB) == 0)
      unlink(entry->path().c_str());
    close(descriptor);
  }
}

}  // namespace orvalis::cli
