// Dump files: raw 16-bit PCM appended under a fixed folder, one file for each handle and purpose.
#pragma once

#include <cstdint>
#include <cstdio>

namespace orvalis {

/// Folder of the end-point detector's and the noise suppressor's dump files.
inline constexpr char kDumpFolder[] = "/sdcard/VRpreprocess/";

/// Folder of dynamics control's dump files.
inline constexpr char kDrcDumpFolder[] = "/sdcard/";

/// Puts a directory in front of dump paths; null or "" removes it. False, with nothing changed, if
/// a path might not fit its buffer.
bool set_dump_root(const char *directory);

/// Opens "<root><folder><handle in decimal><suffix>" for appending; null if that fails.
std::FILE *open_dump(const char *folder, const void *handle, const char *suffix);

/// Appends samples; does nothing without a file. A full disk loses samples silently: a diagnostic
/// must never disturb the audio path.
void write_dump(std::FILE *file, const std::int16_t *samples, int count);

/// Closes a file if there is one.
void close_dump(std::FILE *file);

/// Opens both dump files of a frame driver during a call, so that they exist after it. Nothing is
/// written through these handles.
class DumpFilesPresent {
public:
  DumpFilesPresent(bool wanted, const void *handle, const char *input_suffix,
                   const char *result_suffix) {
    if (!wanted) return;
    input_ = open_dump(kDumpFolder, handle, input_suffix);
    result_ = open_dump(kDumpFolder, handle, result_suffix);
  }
  ~DumpFilesPresent() {
    close_dump(input_);
    close_dump(result_);
  }
  DumpFilesPresent(const DumpFilesPresent &) = delete;
  DumpFilesPresent &operator=(const DumpFilesPresent &) = delete;

private:
  std::FILE *input_ = nullptr;
  std::FILE *result_ = nullptr;
};

/// A handle as log lines and dump files name it.
inline long handle_number(const void *handle) {
  return static_cast<long>(reinterpret_cast<std::intptr_t>(handle));
}

}  // namespace orvalis
