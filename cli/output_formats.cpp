#include "cli/output_formats.h"

#include <sndfile.h>

#include <algorithm>
#include <cctype>
#include <filesystem>

namespace orvalis::cli {
namespace {

struct Format {
  std::string name;
  int number;  ///< libsndfile's
  std::string other_ending;
};

/// Raw samples are little-endian, as they are read.
const std::vector<Format> &formats() {
  static const std::vector<Format> kFormats = {
      {"wav", SF_FORMAT_WAV | SF_FORMAT_PCM_16, "wave"},
      {"flac", SF_FORMAT_FLAC | SF_FORMAT_PCM_16, "fla"},
      {"ogg", SF_FORMAT_OGG | SF_FORMAT_VORBIS, "oga"},
      {"opus", SF_FORMAT_OGG | SF_FORMAT_OPUS, "opus"},
      {"aiff", SF_FORMAT_AIFF | SF_FORMAT_PCM_16, "aif"},
      {"au", SF_FORMAT_AU | SF_FORMAT_PCM_16, "snd"},
      {"caf", SF_FORMAT_CAF | SF_FORMAT_PCM_16, "caf"},
      {"raw", SF_FORMAT_RAW | SF_FORMAT_PCM_16 | SF_ENDIAN_LITTLE, "pcm"},
  };
  return kFormats;
}

}  // namespace

std::vector<std::string> output_format_names() {
  std::vector<std::string> names;
  for (const Format &format : formats()) names.push_back(format.name);
  return names;
}

std::string format_of_name(const std::string &file) {
  std::string ending = std::filesystem::path(file).extension().string();
  if (ending.empty()) return "";
  ending.erase(0, 1);
  std::ranges::transform(ending, ending.begin(),
                         [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  for (const Format &format : formats())
    if (ending == format.name || ending == format.other_ending) return format.name;
  return "";
}

int sndfile_format(const std::string &name) {
  return std::ranges::find(formats(), name, &Format::name)->number;
}

}  // namespace orvalis::cli
