// A file that is still being written: hidden, locked, and gone if it does not get its name.
#pragma once

#include <string>

namespace orvalis::cli {

/// Lies in the folder of its target, under a name that holds a hash of the target's. All of it is
/// thread-safe, except that an object belongs to one thread.
class TemporaryFile {
public:
  /// Throws AudioError.
  explicit TemporaryFile(const std::string &target);
  /// Removes the file unless it was renamed.
  ~TemporaryFile();
  TemporaryFile(const TemporaryFile &) = delete;
  TemporaryFile &operator=(const TemporaryFile &) = delete;

  /// Open for reading and writing; its lock is held as long as this object lives.
  int descriptor() const { return descriptor_; }

  /// Gives the file its target's name, and if it replaces a file, that one's mode and, where
  /// permitted, owner. Returns 0 or an errno.
  int rename(bool may_replace);

  /// Removes what all threads are writing, and lets none go on. The process has to end then.
  static void remove_all();

private:
  bool create();

  std::string target_;
  std::string name_;  ///< "" once it is renamed
  int descriptor_ = -1;
};

/// Removes what runs that were killed have left in a folder: files with names such as TemporaryFile
/// gives them, which nobody has locked.
void remove_leftovers(const std::string &folder);

}  // namespace orvalis::cli
