#include "cli/audio_options.h"

namespace orvalis::cli {

CLI::Validator from_to(int least, int most) { return CLI::Range(least, most).description(""); }

CLI::Option *add_audio_options(CLI::App &command, AudioSettings &settings,
                               const std::string &channel_text) {
  const CLI::Validator channels = from_to(1, 1024);  // what libsndfile takes
  auto *channel = command.add_option("--channel", settings.channel, channel_text)
                      ->check(channels)
                      ->type_name("N");
  auto *raw =
      command.add_flag("--raw", settings.raw, "Input is 16-bit little-endian without a header");
  command.add_option("--rate", settings.raw_rate_hz, "Rate of raw input")
      ->check(from_to(1000, 1000000))
      ->type_name("HZ")
      ->capture_default_str()
      ->needs(raw);
  command.add_option("--channels", settings.raw_channels, "Interleaved channels of raw input")
      ->check(channels)
      ->type_name("N")
      ->capture_default_str()
      ->needs(raw);
  return channel;
}

}  // namespace orvalis::cli
