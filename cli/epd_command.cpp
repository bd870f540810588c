#include "cli/epd_command.h"

#include <orvalis.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "cli/audio_options.h"
#include "cli/detection.h"
#include "cli/detector_options.h"
#include "cli/protected_inputs.h"
#include "cli/report_in_turn.h"
#include "cli/work_files.h"

namespace orvalis::cli {
namespace {

struct EpdOptions {
  std::vector<std::string> files;
  DetectionSettings detection;
  std::string gain = "1";
  std::string format = "table";
  std::string dump_folder;
  std::size_t jobs = 1;
  bool log = false;
  bool frames = false;
  bool trace = false;
};

void prepare_dump(EpdOptions &options) {
  if (options.dump_folder.empty()) return;
  if (options.files.size() > 1)
    throw CLI::ValidationError("--dump", "several files are given, but only one can be dumped");
  if (SetDumpRoot(options.dump_folder.c_str()) != 0)
    throw CLI::ValidationError("--dump", "the folder's name is too long");
  make_folder("--dump", std::filesystem::path(options.dump_folder) / "sdcard/VRpreprocess");
  options.detection.detector.pcm_dump = 1;
}

int run_epd(const CLI::App &command, EpdOptions &options) {
  if (std::ranges::count(options.files, "-") > 1)
    throw CLI::ValidationError("FILE", "standard input can be read only once");
  std::string &format = options.format;
  if (options.trace) format = trace_format(command, format);
  if (options.frames && format != "table" && format != "json" && format != "csv")
    throw CLI::ValidationError("--frames", "the format " + format + " knows utterances only");
  if (options.frames) options.detection.reported = Reported::kFrames;
  if (options.trace) options.detection.reported = Reported::kTrace;
  options.detection.detector.input_gain = options.gain == "0.25" ? 1 : options.gain == "4" ? 2 : 0;
  const auto report = make_report(format, "--format", options.files.size());
  protect_inputs(options.files);
  prepare_split(options.detection.split, options.files);
  prepare_dump(options);
  if (!options.log) SetLogSink([](int, const char *, const char *, void *) {}, nullptr);

  const WorkSettings settings{.jobs = options.jobs, .progress = !options.log};
  return work_files(options.files, settings,
                    [&](std::size_t job, Turn &turn, const Advanced &advanced) {
                      ReportInTurn in_turn(*report, turn);
                      detect(options.files[job], options.detection, in_turn, advanced);
                    });
}

constexpr const char *kExamples = R"(Input:
  Any file that libsndfile reads (WAV, FLAC, Ogg, MP3, AIFF, AU, ...), at any rate.
  8 and 16 kHz audio of 16 bits is judged as it is. Other rates are resampled to
  16 kHz, other sample formats rounded to 16 bits; what exceeds full scale clips.
  Several channels are averaged unless --channel picks one.
  "-" reads standard input: WAV (or AIFF, AU, Ogg), or with --raw samples alone.
  Each utterance is printed the moment it is decided. Of all but --raw standard input
  the first 10 s are waited for (--no-lead-in).

Files of utterances:
  --split clips writes take.wav's utterances to clips/take-001.wav, clips/take-002.wav
  and so on: the samples of the input with its rate, channels and sample format.
  Standard input gives what the engine heard, as clips/stdin-001.wav and so on.

Output:
  Times are seconds of the input. "start" and "end" are the borders of the
  utterance; "began" and "ended" tell when the detector gave its first and last
  answer "speech". "open" marks an utterance that the end of the audio has cut.
    table     to read
    json      one object a line; *_sample fields count samples at its "rate"
    csv       for a spreadsheet
    labels    a label track for Audacity (one file)
    textgrid  an interval tier for Praat (one file, written at its end)
    rttm      SPEAKER lines for diarisation tools

Exit status:
  0 all files done; 1 a file could not be read or split (the others are done); 2 wrong
  usage.

Examples:
  orvalis epd meeting.wav
  orvalis epd --format json --hangover 800 a.flac b.mp3
  orvalis epd --pad-before 0 --pad-after 0 --channel 2 call.wav
  orvalis epd --raw --rate 8000 line.raw
  orvalis epd --split clips --pad-before 300 --pad-after 400 meeting.wav
  orvalis epd --jobs 4 --format csv *.flac >all.csv
  orvalis epd --format labels take.wav >take.txt
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis epd --raw -)";

}  // namespace

void add_epd_command(CLI::App &app, int &exit_status) {
  const auto options = std::make_shared<EpdOptions>();
  CLI::App *epd = app.add_subcommand("epd", "Find the utterances in audio files or live audio");
  epd->footer(kExamples);
  epd->add_option("FILE", options->files, "Audio files; \"-\" is standard input")
      ->required()
      ->type_name("");
  add_report_option(*epd, "--format", options->format);
  const UtteranceOptions utterances =
      add_detector_options(*epd, options->detection.detector, options->detection.split);
  epd->add_option("--gain", options->gain, "Gain of the input: 0.25, 1 or 4 (wraps beyond 16 bits)")
      ->check(CLI::IsMember({"0.25", "1", "4"}).description(""))
      ->type_name("G")
      ->capture_default_str();
  epd->add_flag("--force", options->detection.split.replace, "Replace files that are there already")
      ->needs(utterances.split);
  auto *frames = epd->add_flag("--frames", options->frames,
                               "Print the answer to every frame of 10 ms\ninstead of utterances");
  auto *trace =
      epd->add_flag("--trace", options->trace,
                    "Print the answer to every frame and what led to it,\nas csv or json");
  trace->excludes(frames);
  for (CLI::Option *option : utterances.all) {
    frames->excludes(option);
    trace->excludes(option);
  }
  auto *jobs = epd->add_option("--jobs", options->jobs, "Files to work on at once")
                   ->check(from_to(1, 256))
                   ->type_name("N")
                   ->capture_default_str();
  epd->add_flag("--log", options->log, "Show the engine's log lines on standard error")
      ->excludes(jobs);
  epd->add_option("--dump", options->dump_folder,
                  "Let the engine write its dump files below\nthis folder (of one file)")
      ->check(not_empty())
      ->type_name("DIR");

  add_audio_options(*epd, options->detection.audio);
  epd->callback([options, epd, &exit_status] { exit_status = run_epd(*epd, *options); });
}

}  // namespace orvalis::cli
