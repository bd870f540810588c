#include "cli/enhance_commands.h"

#include <orvalis.h>

#include <algorithm>
#include <limits>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "cli/audio_options.h"
#include "cli/audio_output.h"
#include "cli/detector_options.h"
#include "cli/enhancement.h"
#include "cli/output_formats.h"
#include "cli/output_plan.h"
#include "cli/protected_inputs.h"
#include "cli/report_in_turn.h"
#include "cli/work_files.h"

namespace orvalis::cli {
namespace {

struct EnhanceOptions {
  std::vector<std::string> inputs;  ///< The last one is the output, until the work begins
  PathSettings work;
  std::string format;
  std::string report = "table";
  std::size_t jobs = 1;
  bool not_aligned = false;
};

int run(EnhanceOptions &options) {
  PathSettings &work = options.work;
  std::string destination = options.inputs.back();
  options.inputs.pop_back();
  if (destination == "/dev/stdout") destination = "-";  // what is printed must not get between
  if (std::ranges::count(options.inputs, "-") > 1)
    throw CLI::ValidationError("FILE", "standard input can be read only once");
  const auto report = make_report(options.report, "--report", options.inputs.size());
  const auto outputs = plan_outputs(options.inputs, destination, options.format);
  protect_inputs(options.inputs);
  prepare_split(work.split, options.inputs);
  if (destination == "-") {
    if (is_protected("-")) throw std::runtime_error("standard output: the file is an input");
    reserve_standard_output();
  }
  SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  work.audio.wide_only = true;
  work.audio.pair = work.enhancement.microphones == 2;
  work.enhancement.aligned = options.not_aligned ? 0 : 1;
  work.split.replace = work.replace;
  return work_files(options.inputs, {.jobs = options.jobs},
                    [&](std::size_t job, Turn &turn, const Advanced &advanced) {
                      const std::string &name = options.inputs[job];
                      ReportInTurn in_turn(*report, turn);
                      const auto tell = [&](const std::string &text) {
                        turn.act([&name, text] { print_note(name, text); });
                      };
                      enhance(name, outputs[job], work, in_turn, tell, advanced);
                    });
}

constexpr const char *kInputAndOutput = R"(
Input:
  Any file that libsndfile reads (WAV, FLAC, Ogg, MP3, AIFF, AU, ...), at any rate.
  16 kHz audio of 16 bits is worked on as it is. Other rates are resampled to 16 kHz,
  other sample formats rounded to 16 bits; what exceeds full scale clips. Several
  channels are refused unless an option says what to do with them.
  "-" reads standard input: WAV (or AIFF, AU, Ogg), or with --raw samples alone.

Output:
  One channel of 16 bits at 16 kHz, or with --keep-rate at the input's own rate, as
  long as the input and no later. The name tells the format: .wav, .flac, .ogg, .opus,
  .aiff, .au, .caf or .raw. A file appears under its name when it is complete, and
  never in place of an input, or of any other file without --force. Into a folder,
  inputs go under their own names. "-" writes standard output while the input still
  comes: WAV of open length, or raw.

Exit status:
  0 all files done; 1 a file could not be read or written (the others are done);
  2 wrong usage.
)";

constexpr const char *kDenoiseNotes = R"(
Examples:
  orvalis denoise meeting.wav clean.wav
  orvalis denoise --level 18 --keep-rate call.flac clean.flac
  orvalis denoise --mics 2 headset.wav clean.wav
  orvalis denoise --jobs 4 *.wav cleaned/
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis denoise --raw - - | aplay -q)";

constexpr const char *kLevelNotes = R"(
Standard error tells for how long the audio was loud, and how many samples of input
and output are at full scale.

Examples:
  orvalis level meeting.wav level.wav
  orvalis level --channel 2 call.wav level.flac)";

constexpr const char *kProcessNotes = R"(
The utterances are those of the processed audio, printed on standard output, or on
standard error if audio goes there. --split writes them as processed, at 16 kHz.

Examples:
  orvalis process meeting.wav out.wav
  orvalis process --report json --split clips meeting.wav out.flac
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis process --raw - out.wav)";

/// A command with the options that all of them have.
CLI::App *add_command(CLI::App &app, const char *name, const char *summary, const char *notes,
                      const std::shared_ptr<EnhanceOptions> &options, int &exit_status) {
  CLI::App *command = app.add_subcommand(name, summary);
  command->footer(std::string(kInputAndOutput).substr(1) + notes);
  PathSettings &work = options->work;
  command
      ->add_option("FILE", options->inputs,
                   "Inputs, \"-\" for standard input; then the output:\n"
                   "a file, a folder, or \"-\" for standard output")
      ->required()
      ->option_text("REQUIRED")
      ->expected(2, std::numeric_limits<int>::max())
      ->type_name("");
  command->add_option("--format", options->format, "Format of the output (default: by its name)")
      ->check(CLI::IsMember(output_format_names()).description(""))
      ->type_name("NAME");
  command->add_flag("--force", work.replace, "Replace files that are there already");
  command->add_flag("--keep-rate", work.keep_rate, "Convert back to the rate of the input");
  command->add_option("--jobs", options->jobs, "Files to work on at once")
      ->check(from_to(1, 256))
      ->type_name("N")
      ->capture_default_str();
  CLI::Option *channel =
      add_audio_options(*command, work.audio, "Channel to work on, from 1, of several");
  command->add_flag("--mix", work.mix, "Work on the mean of several channels")->excludes(channel);
  if (work.enhancement.suppression_db > 0) {
    command
        ->add_option("--level", work.enhancement.suppression_db,
                     "Suppression of one microphone in dB: 13 or 18")
        ->check(CLI::IsMember({13, 18}).description(""))
        ->type_name("DB")
        ->capture_default_str();
    command
        ->add_option("--mics", work.enhancement.microphones,
                     "Microphones, 1 or 2; two are two channels,\nand the first one is cleaned")
        ->check(from_to(1, 2))
        ->type_name("N")
        ->capture_default_str();
  }
  command->callback([options, command, &exit_status] {
    if (options->work.enhancement.microphones == 2)
      for (const char *of_one : {"--level", "--channel", "--mix"})
        if (command->count(of_one) > 0) throw CLI::ExcludesError("--mics 2", of_one);
    exit_status = run(*options);
  });
  return command;
}

}  // namespace

void add_enhance_commands(CLI::App &app, int &exit_status) {
  const auto denoise = std::make_shared<EnhanceOptions>();
  add_command(app, "denoise", "Take the noise from speech", kDenoiseNotes, denoise, exit_status)
      ->add_flag("--no-align", denoise->not_aligned,
                 "Keep the suppressor's delay: 48 samples,\n160 with two microphones");

  const auto level = std::make_shared<EnhanceOptions>();
  level->work.enhancement.suppression_db = 0;
  level->work.enhancement.level = 1;
  add_command(app, "level", "Level recorded speech: dynamics control", kLevelNotes, level,
              exit_status);

  const auto process = std::make_shared<EnhanceOptions>();
  process->work.enhancement.level = 1;
  process->work.detect = true;
  CLI::App *command =
      add_command(app, "process", "Denoise, level, and find the utterances of the result",
                  kProcessNotes, process, exit_status);
  add_report_option(*command, "--report", process->report);
  add_detector_options(*command, process->work.detector, process->work.split);
}

}  // namespace orvalis::cli
