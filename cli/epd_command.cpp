#include "cli/epd_command.h"

#include <orvalis.h>
#include <utterance_stream.h>

#include <algorithm>
#include <csignal>
#include <limits>
#include <memory>
#include <new>
#include <span>
#include <string>
#include <vector>

#include "cli/audio_options.h"
#include "cli/audio_source.h"
#include "cli/label_reports.h"
#include "cli/report.h"

namespace orvalis::cli {
namespace {

struct EpdOptions {
  std::vector<std::string> files;
  AudioSettings audio;
  UtteranceSettings detector = UTTERANCE_SETTINGS_DEFAULT;
  std::string gain = "1";
  std::string format = "table";
  bool frames = false;
  bool log = false;
};

struct StreamCloser {
  void operator()(UtteranceStream *stream) const { CloseUtteranceStream(stream); }
};

struct EpdCloser {
  void operator()(EpdInstance *epd) const { FreeMemoryEPD(epd); }
};

void report_utterances(AudioSource &source, const UtteranceSettings &settings, Report &report) {
  const std::unique_ptr<UtteranceStream, StreamCloser> stream(OpenUtteranceStream(&settings));
  if (!stream) throw std::bad_alloc();
  const auto report_decided = [&] {
    for (Utterance found; NextUtterance(stream.get(), &found) == 1;) report.utterance(found);
  };
  for (auto piece = source.read(); !piece.empty(); piece = source.read()) {
    while (!piece.empty()) {
      const auto taken =
          PushUtteranceAudio(stream.get(), piece.data(), static_cast<std::int32_t>(piece.size()));
      piece = piece.subspan(static_cast<std::size_t>(taken));
      report_decided();
    }
  }
  FlushUtteranceStream(stream.get());
  report_decided();
}

void report_frames(AudioSource &source, const UtteranceSettings &settings, Report &report) {
  const bool narrow_band = settings.rate_hz == 8000;
  const std::size_t frame_length = narrow_band ? 80 : 160;
  const std::int32_t mode = settings.input_gain * 10000 + (narrow_band ? 1000 : 0);
  const std::unique_ptr<EpdInstance, EpdCloser> epd(InitializeEPD(mode, 0));
  if (!epd) throw std::bad_alloc();

  std::int64_t number = 0;
  source.for_each_block(frame_length, [&](std::span<const std::int16_t> frame) {
    const auto samples = static_cast<std::int32_t>(frame.size());
    report.frame(number++,
                 ProcessEPDFrameByCnttype(epd.get(), frame.data(), samples, settings.content_type));
  });
}

void report_file(const std::string &name, const EpdOptions &options, Report &report) {
  AudioSource source(name, options.audio);
  UtteranceSettings settings = options.detector;
  settings.rate_hz = source.rate_hz();
  report.begin_file(name, settings.rate_hz);
  (options.frames ? report_frames : report_utterances)(source, settings, report);
  report.end_file(source.samples_read());
  // Last, so that a damaged file still gives what could be decided.
  source.check_complete();
}

/// Ctrl-C ends whoever writes into the pipe as well: what was said last is then still reported, at
/// the end of the input. A second Ctrl-C ends the tool.
void outlive_one_interrupt() {
  std::signal(SIGINT, [](int) { std::signal(SIGINT, SIG_DFL); });
}

std::unique_ptr<Report> make_report(const EpdOptions &options) {
  const bool several = options.files.size() > 1;
  const std::string &format = options.format;
  if (format == "json") return make_json_report();
  if (format == "csv") return make_csv_report();
  if (options.frames && format != "table")
    throw CLI::ValidationError("--frames", "the format " + format + " knows utterances only");
  if (format == "rttm") return make_rttm_report();
  if (several && format != "table")
    throw CLI::ValidationError("--format", format + " describes one file, but several are given");
  if (format == "labels") return make_labels_report();
  if (format == "textgrid") return make_textgrid_report();
  return make_table_report(several);
}

int run_epd(EpdOptions &options) {
  const auto inputs = std::ranges::count(options.files, "-");
  if (inputs > 1) throw CLI::ValidationError("FILE", "standard input can be read only once");
  if (inputs == 1) outlive_one_interrupt();
  options.detector.input_gain = options.gain == "0.25" ? 1 : options.gain == "4" ? 2 : 0;
  if (!options.log) SetLogSink([](int, const char *, const char *, void *) {}, nullptr);

  const std::unique_ptr<Report> report = make_report(options);
  int status = 0;
  for (const std::string &name : options.files) {
    try {
      report_file(name, options, *report);
    } catch (const AudioError &error) {
      print_input_error(name, error);
      status = 1;
    }
  }
  return status;
}

constexpr const char *kExamples = R"(Input:
  Any file that libsndfile reads (WAV, FLAC, Ogg, MP3, AIFF, AU, ...), at any rate.
  8 and 16 kHz audio of 16 bits is judged as it is. Other rates are resampled to
  16 kHz, other sample formats rounded to 16 bits; what exceeds full scale clips.
  Several channels are averaged unless --channel picks one.
  "-" reads standard input: WAV (or AIFF, AU, Ogg), or with --raw samples alone.
  Each utterance is printed the moment it is decided.

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
  0 all files done; 1 a file could not be read (the others are done); 2 wrong usage.

Examples:
  orvalis epd meeting.wav
  orvalis epd --format json --hangover 800 a.flac b.mp3
  orvalis epd --pad-before 200 --pad-after 300 --channel 2 call.wav
  orvalis epd --raw --rate 8000 line.raw
  orvalis epd --format labels take.wav >take.txt
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis epd --raw -)";

}  // namespace

void add_epd_command(CLI::App &app, int &exit_status) {
  const auto options = std::make_shared<EpdOptions>();
  UtteranceSettings &detector = options->detector;
  const CLI::Validator milliseconds = from_to(0, 3600 * 1000);

  CLI::App *epd = app.add_subcommand("epd", "Find the utterances in audio files or live audio");
  epd->footer(kExamples);
  epd->add_option("FILE", options->files, "Audio files; \"-\" is standard input")
      ->required()
      ->type_name("");
  epd->add_option("--format", options->format, "table, json, csv, labels, textgrid or rttm")
      ->check(CLI::IsMember({"table", "json", "csv", "labels", "textgrid", "rttm"}).description(""))
      ->type_name("NAME")
      ->capture_default_str();

  auto *hangover = epd->add_option("--hangover", detector.hangover_ms,
                                   "Longest silence that joins what is before and after it");
  auto *before =
      epd->add_option("--pad-before", detector.pad_before_ms, "Time to add before an utterance");
  auto *after =
      epd->add_option("--pad-after", detector.pad_after_ms, "Time to add after an utterance");
  for (CLI::Option *option : {hangover, before, after})
    option->check(milliseconds)->type_name("MS")->capture_default_str();

  epd->add_option("--content-type", detector.content_type,
                  "Timing: 0 or 1; 2 and more are quicker\nand refuse short sounds")
      ->check(from_to(0, std::numeric_limits<int>::max()))
      ->type_name("N")
      ->capture_default_str();
  epd->add_option("--gain", options->gain, "Gain of the input: 0.25, 1 or 4 (wraps beyond 16 bits)")
      ->check(CLI::IsMember({"0.25", "1", "4"}).description(""))
      ->type_name("G")
      ->capture_default_str();
  epd->add_flag("--frames", options->frames,
                "Print the answer to every frame of 10 ms\ninstead of utterances")
      ->excludes(hangover)
      ->excludes(before)
      ->excludes(after);
  epd->add_flag("--log", options->log, "Show the engine's log lines on standard error");

  add_audio_options(*epd, options->audio);
  epd->callback([options, &exit_status] { exit_status = run_epd(*options); });
}

}  // namespace orvalis::cli
