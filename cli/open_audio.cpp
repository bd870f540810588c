#include "cli/open_audio.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace orvalis::cli {
namespace {

std::string reason() { return std::generic_category().message(errno); }

struct stat status_of(const std::string &name) {
  struct stat status;
  if ((name == "-" ? fstat(STDIN_FILENO, &status) : stat(name.c_str(), &status)) != 0)
    throw AudioError(reason());
  return status;
}

/// Whether a format can be followed without seeking. The others fail on a pipe, some silently.
bool streams(int format) {
  switch (format & SF_FORMAT_TYPEMASK) {
    case SF_FORMAT_RAW:
    case SF_FORMAT_WAV:
    case SF_FORMAT_WAVEX:
    case SF_FORMAT_AU:
    case SF_FORMAT_AIFF:
    case SF_FORMAT_OGG:
      return true;
    default:
      return false;
  }
}

/// A pipe's descriptor, once it has something to read.
int open_pipe(const std::string &name) {
  const int descriptor = name == "-" ? STDIN_FILENO : open(name.c_str(), O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) throw AudioError(reason());
  pollfd readable{descriptor, POLLIN, 0};
  while (poll(&readable, 1, -1) < 0 && errno == EINTR) {
  }
  return descriptor;
}

}  // namespace

std::unique_lock<std::mutex> lock_opening() {
  static std::mutex opening;
  return std::unique_lock(opening);
}

OpenAudio open_audio(const std::string &name, const AudioSettings &settings) {
  OpenAudio audio;
  const struct stat status = status_of(name);
  audio.piped = !S_ISREG(status.st_mode);
  if (S_ISDIR(status.st_mode)) throw AudioError(std::generic_category().message(EISDIR));
  if (!settings.raw && !audio.piped && status.st_size == 0) throw AudioError("the file is empty");

  if (settings.raw) {
    audio.info.format = SF_FORMAT_RAW | SF_FORMAT_PCM_16 | SF_ENDIAN_LITTLE;
    audio.info.samplerate = settings.raw_rate_hz;
    audio.info.channels = settings.raw_channels;
  }
  // A pipe may stay silent for long, so that is waited for before the others are kept waiting.
  const bool by_name = name != "-" && !audio.piped;
  const int descriptor = by_name ? -1 : audio.piped ? open_pipe(name) : STDIN_FILENO;

  const auto lock = lock_opening();
  audio.file.reset(by_name
                       ? sf_open(name.c_str(), SFM_READ, &audio.info)
                       : sf_open_fd(descriptor, SFM_READ, &audio.info, descriptor != STDIN_FILENO));
  if (audio.piped && (!audio.file || !streams(audio.info.format)))
    throw AudioError("not WAV, AIFF, AU or Ogg audio, as a pipe must carry (or use --raw)");
  if (!audio.file) throw AudioError(sf_strerror(nullptr));
  return audio;
}

}  // namespace orvalis::cli
