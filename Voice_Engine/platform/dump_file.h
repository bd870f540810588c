// Dump files: raw 16-bit PCM appended under a fixed folder, one file for each handle and purpose.
#pragma once

#include <cstdio>

#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

/// Folder of the end-point detector's and the noise suppressor's dump files.
inline constexpr char kDumpFolder[] = "/sdcard/VRpreprocess/";

/// Puts a directory in front of dump paths; null or "" restores none. False, changing nothing, if
/// a path might then not fit its buffer.
bool set_dump_root(const char *directory);

/// Opens "<root><folder><handle in decimal><suffix>" for appending; null if that fails.
std::FILE *open_dump(const char *folder, const void *handle, const char *suffix);

/// Appends samples; does nothing without a file. A full disk loses samples silently: dumps are a
/// diagnostic and must never disturb the audio path.
void write_dump(std::FILE *file, const Word16 *samples, int count);

/// Closes a file if there is one.
void close_dump(std::FILE *file);

}  // namespace orvalis
