// kelimg: the kel_images routines applied to picture files from the command line.
//
// Every subcommand reads its pictures, checks what the routine needs of them, calls the library
// and only then writes its output, so bad input ends with a one-line message on stderr, exit
// status 2 and no output file.
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <atomic>
#include <charconv>
#include <cinttypes>
#include <cmath>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <functional>
#include <iterator>
#include <memory>
#include <mutex>
#include <new>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "demo.h"
#include "figures.h"
#include "kel_images.h"
#include "operations.h"
#include "picture.h"

namespace {

using kelimg::InputError;
using kelimg::Picture;

constexpr int kBadInput = 2;
constexpr int kInternalError = 1;

struct Subcommand {
  CLI::App *app;
  std::function<void()> run;
};

// CLI11's ranges call every failure "not in range"; these say when the text is no number at all
// (or not a whole one), and leave "not in range" for numbers outside the range.
std::string number_problem(const std::string &text) {
  char *end = nullptr;
  const double value = std::strtod(text.c_str(), &end);
  if (text.empty() || *end != '\0' || std::isnan(value)) return "'" + text + "' is not a number";
  if (std::isinf(value)) return "'" + text + "' is not a finite number";
  return "";
}

CLI::Validator whole_number(int64_t low, int64_t high) {
  const std::string range = std::to_string(low) + " to " + std::to_string(high);
  return CLI::Validator(
      [low, high, range](std::string &text) -> std::string {
        const char *first = text.data() + (text.size() > 1 && text[0] == '+');
        const char *last = text.data() + text.size();
        int64_t value = 0;
        const auto [end, error] = std::from_chars(first, last, value);
        if (error == std::errc() && end == last) {
          return value < low || value > high ? text + " is not in range " + range : "";
        }
        const std::string problem = number_problem(text);
        return problem.empty() ? "'" + text + "' is not a whole number" : problem;
      },
      "INT in [" + std::to_string(low) + " - " + std::to_string(high) + "]");
}

CLI::Validator real_number(double low, double high) {
  return CLI::Validator(
      [low, high](std::string &text) -> std::string {
        const std::string problem = number_problem(text);
        if (!problem.empty()) return problem;
        const double value = std::strtod(text.c_str(), nullptr);
        if (value >= low && value <= high) return "";
        return text + " is not in range " + CLI::detail::to_string(low) + " to " +
               CLI::detail::to_string(high);
      },
      "FLOAT in [" + CLI::detail::to_string(low) + " - " + CLI::detail::to_string(high) + "]");
}

// The commands that turn one picture into another take IN OUT, or any number of INs with
// --out-dir.
struct Pictures {
  std::vector<std::string> files;
  std::string out_dir;
};

void add_pictures(CLI::App *command, Pictures &pictures) {
  command
      ->add_option("FILES", pictures.files,
                   "IN OUT: the picture to read and the one to write (- for standard input or "
                   "output); with --out-dir, any number of INs")
      ->required();
  command
      ->add_option("--out-dir", pictures.out_dir,
                   "write each IN into this existing directory under its own name, all at once on "
                   "every core")
      ->check(CLI::ExistingDirectory);
}

// A picture's operation, which may also have a line to say about the result.
using Transform = std::function<Picture(const Picture &, std::string &report)>;

// "kelimg rotate: 12/40 pictures" on one line of the terminal, for batches long enough to wait
// on; nothing when stderr is a file or a pipe.
class Progress {
 public:
  Progress(const std::string &context, size_t total)
      : context_(context), total_(total), shown_(total >= 8 && isatty(STDERR_FILENO) != 0) {}
  ~Progress() {
    if (shown_) std::fprintf(stderr, "\r\033[K");
  }
  void step() {
    const std::lock_guard<std::mutex> lock(mutex_);
    ++done_;
    if (shown_) std::fprintf(stderr, "\r%s: %zu/%zu pictures", context_.c_str(), done_, total_);
  }

 private:
  std::mutex mutex_;
  std::string context_;
  size_t total_, done_ = 0;
  bool shown_;
};

// Every picture is read, transformed and staged beside its output, in parallel, before any
// output is put in place: a bad input anywhere leaves every output as it was.
void transform_batch(const Pictures &pictures, const std::string &context,
                     const Transform &transform) {
  const size_t count = pictures.files.size();
  std::vector<std::string> outputs;
  std::set<std::string> taken;
  for (const std::string &input : pictures.files) {
    if (input == "-") throw InputError("standard input (-) cannot be read with --out-dir");
    outputs.push_back(
        (std::filesystem::path(pictures.out_dir) / std::filesystem::path(input).filename())
            .string());
    kelimg::output_format(outputs.back());
    if (!taken.insert(outputs.back()).second) {
      throw InputError("two inputs would both be written to '" + outputs.back() + "'");
    }
  }
  std::vector<std::optional<kelimg::PendingOutput>> staged(count);
  std::vector<std::string> reports(count);
  std::vector<std::exception_ptr> failures(count);
  std::atomic<size_t> next{0};
  std::atomic<bool> failed{false};
  Progress progress(context, count);
  const auto work = [&] {
    for (size_t i = next++; i < count && !failed; i = next++) {
      try {
        const Picture picture = kelimg::load_picture(pictures.files[i]);
        Picture result;
        try {
          result = transform(picture, reports[i]);
        } catch (const InputError &error) {
          throw InputError("'" + pictures.files[i] + "': " + error.what());
        }
        staged[i].emplace(kelimg::stage_picture(outputs[i], result));
      } catch (...) {
        failures[i] = std::current_exception();
        failed = true;
      }
      progress.step();
    }
  };
  std::vector<std::thread> helpers;
  const size_t threads = std::min<size_t>(count, std::max(1u, std::thread::hardware_concurrency()));
  for (size_t t = 1; t < threads; ++t) helpers.emplace_back(work);
  work();
  for (std::thread &helper : helpers) helper.join();
  for (const std::exception_ptr &failure : failures) {
    if (failure) std::rethrow_exception(failure);
  }
  for (std::optional<kelimg::PendingOutput> &output : staged) output->commit();
  for (size_t i = 0; i < count; ++i) {
    if (!reports[i].empty()) std::printf("%s: %s\n", pictures.files[i].c_str(), reports[i].c_str());
  }
}

void transform_pictures(const Pictures &pictures, const std::string &context,
                        const Transform &transform) {
  if (!pictures.out_dir.empty()) return transform_batch(pictures, context, transform);
  if (pictures.files.size() != 2) throw InputError("give IN and OUT, or several INs and --out-dir");
  kelimg::output_format(pictures.files[1]);  // refuse a bad name before the work
  std::string report;
  kelimg::save_picture(pictures.files[1],
                       transform(kelimg::load_picture(pictures.files[0]), report));
  // A picture written to standard output keeps it to itself.
  if (!report.empty())
    std::fprintf(pictures.files[1] == "-" ? stderr : stdout, "%s\n", report.c_str());
}

void add_input(CLI::App *command, std::string &path, const char *name = "IN",
               const char *description = "picture to read (- for standard input)") {
  command->add_option(name, path, description)->required();
}

void add_output(CLI::App *command, std::string &path) {
  command->add_option("OUT", path, "picture to write (- for standard output)")->required();
}

// The true mean, variance and deviation from 64-bit sums, beside the library's figures, which are
// whole numbers from sums that wrap at 32 bits.
void print_exact_figures(std::FILE *text, const kelimg::Statistics &stats) {
  uint64_t sum = 0;
  for (uint32_t value = 0; value < 256; ++value) sum += uint64_t{stats.histogram[value]} * value;
  const double mean = static_cast<double>(sum) / stats.count;
  double squares = 0;
  for (uint32_t value = 0; value < 256; ++value) {
    squares += stats.histogram[value] * (value - mean) * (value - mean);
  }
  const double variance = squares / stats.count;
  std::fprintf(text,
               "exact (64-bit sums, by kelimg):\nmean      %.4f\nvariance  %.4f\nstd dev   %.4f\n",
               mean, variance, std::sqrt(variance));
}

Subcommand add_stats(CLI::App &app) {
  struct Options {
    std::string input, plot;
    bool histogram = false, exact = false;
    uint32_t bits = 8;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(
      "stats", "Print the mean, variance and standard deviation of a picture's values");
  add_input(command, o->input);
  command->add_option("--plot", o->plot, "also draw the histogram into this picture")
      ->type_name("FILE");
  command->add_flag("--exact", o->exact,
                    "also print the true figures, with fractions and sums that do not wrap");
  CLI::Option *histogram =
      command->add_flag("--histogram", o->histogram, "also print the histogram, one bin a line");
  command
      ->add_option("--bits", o->bits,
                   "bin the histogram by the top BITS bits of each value (2^BITS bins)")
      ->check(whole_number(0, 8))
      ->needs(histogram);
  return {command, [o] {
            if (!o->plot.empty()) kelimg::output_format(o->plot);
            const Picture picture = kelimg::load_picture(o->input);
            const kelimg::Statistics stats = kelimg::statistics(picture);
            if (!o->plot.empty()) kelimg::save_picture(o->plot, kelimg::plot_histogram(stats));
            // A plot written to standard output keeps it to itself.
            std::FILE *text = o->plot == "-" ? stderr : stdout;
            std::fprintf(text, "size      %" PRId32 " x %" PRId32 " (%" PRIu32 " pixels)\n",
                         picture.width, picture.height, stats.count);
            std::fprintf(text,
                         "library (whole numbers, 32-bit sums):\nmean      %u\nvariance  %u\n"
                         "std dev   %u\n",
                         stats.mean, stats.variance, stats.std_dev);
            if (o->exact) print_exact_figures(text, stats);
            if ((stats.mean_wrapped || stats.variance_wrapped) && !o->exact) {
              std::fprintf(stderr,
                           "kelimg stats: warning: the %s sum passed 32 bits and wrapped, as the "
                           "library's sums do; --exact prints the true figures\n",
                           stats.mean_wrapped ? "intensity" : "squared deviation");
            }
            if (!o->histogram) return;
            const std::vector<uint32_t> bins = kelimg::reduced_histogram(picture, o->bits);
            const uint32_t span = 256u >> o->bits;
            for (uint32_t bin = 0; bin < bins.size(); ++bin) {
              if (span == 1) {
                std::fprintf(text, "%u %" PRIu32 "\n", bin, bins[bin]);
              } else {
                std::fprintf(text, "%u-%u %" PRIu32 "\n", bin * span, bin * span + span - 1,
                             bins[bin]);
              }
            }
          }};
}

Subcommand add_rotate(CLI::App &app) {
  struct Options {
    Pictures pictures;
    int angle = 0;
    double degrees = 0;
    bool int8 = false, nearest = false;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(
      "rotate",
      "Turn a picture clockwise onto a canvas just large enough for it; prints the canvas size "
      "and where the picture's corner (0, 0) landed");
  add_pictures(command, o->pictures);
  CLI::Option_group *angle = command->add_option_group("angle", "exactly one of");
  CLI::Option *units = angle->add_option("--angle", o->angle, "angle in 1/256 turns (64 = 90°)")
                           ->check(whole_number(0, 255));
  angle->add_option("--deg", o->degrees, "angle in degrees, rounded to 1/256 turns")
      ->check(real_number(-360.0, 360.0));
  angle->require_option(1);
  CLI::Option *int8 = command->add_flag(
      "--int8", o->int8,
      "rotate as signed pixels (value - 128), bilinear; uncovered pixels become 128");
  command
      ->add_flag("--nearest", o->nearest,
                 "rotate as signed pixels, nearest neighbour; uncovered pixels become 0")
      ->excludes(int8);
  return {command, [o, units] {
            const uint8_t turn =
                *units ? static_cast<uint8_t>(o->angle) : kelimg::degrees_to_angle(o->degrees);
            const kelimg::Resampling resampling =
                o->nearest
                    ? kelimg::Resampling::nearest_int8
                    : (o->int8 ? kelimg::Resampling::bilinear_int8 : kelimg::Resampling::bilinear);
            transform_pictures(o->pictures, "kelimg rotate",
                               [turn, resampling](const Picture &picture, std::string &report) {
                                 kelimg::Rotated rotated =
                                     kelimg::rotate(picture, turn, resampling);
                                 report = "angle " + std::to_string(turn) + "/256 turn; canvas " +
                                          std::to_string(rotated.canvas.width) + " x " +
                                          std::to_string(rotated.canvas.height) +
                                          "; the picture's corner (0, 0) is at (" +
                                          std::to_string(rotated.offset_x) + ", " +
                                          std::to_string(rotated.offset_y) + ")";
                                 return std::move(rotated.canvas);
                               });
          }};
}

// brighten and darken differ only in the direction they move the values.
Subcommand add_brightness(CLI::App &app, const char *name, const char *description,
                          Picture (*operation)(const Picture &, uint32_t)) {
  struct Options {
    Pictures pictures;
    uint32_t percent = 0;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(name, description);
  add_pictures(command, o->pictures);
  command->add_option("--percent", o->percent, "how far to move every value, 0 to 100")
      ->required()
      ->check(whole_number(0, 100));
  return {command, [o, operation, name] {
            transform_pictures(o->pictures, std::string("kelimg ") + name,
                               [o, operation](const Picture &picture, std::string &) {
                                 return operation(picture, o->percent);
                               });
          }};
}

Subcommand add_mask(CLI::App &app) {
  struct Options {
    Pictures pictures;
    int key = 0;
    bool raw = false;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(
      "mask", "Make a mask: 0 where the picture holds the key value, 255 (or 1) elsewhere");
  add_pictures(command, o->pictures);
  command->add_option("--key", o->key, "the value to mark")
      ->required()
      ->check(whole_number(0, 255));
  command->add_flag("--raw", o->raw, "write the library's 0/1 values instead of 0/255");
  return {command, [o] {
            transform_pictures(o->pictures, "kelimg mask",
                               [o](const Picture &picture, std::string &) {
                                 return kelimg::mask(picture, o->key, !o->raw);
                               });
          }};
}

Subcommand add_fill(CLI::App &app) {
  struct Options {
    Pictures pictures;
    std::string mask;
    int key = 0;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command =
      app.add_subcommand("fill", "Fill a hole in a picture smoothly from the values around it");
  add_pictures(command, o->pictures);
  CLI::Option_group *hole = command->add_option_group("hole", "exactly one of");
  CLI::Option *key = hole->add_option("--key", o->key, "the hole is every pixel holding this value")
                         ->check(whole_number(0, 255));
  hole->add_option("--mask", o->mask,
                   "the hole is every pixel where this picture (same size) holds 0")
      ->type_name("FILE");
  hole->require_option(1);
  return {command, [o, key] {
            const Picture hole_mask = key->count() > 0 ? Picture() : kelimg::load_picture(o->mask);
            const bool by_key = key->count() > 0;
            transform_pictures(o->pictures, "kelimg fill",
                               [o, by_key, &hole_mask](const Picture &picture, std::string &) {
                                 return kelimg::fill(
                                     picture,
                                     by_key ? kelimg::mask(picture, o->key, false) : hole_mask);
                               });
          }};
}

// paste and blend share their arguments and differ only in what a visible pixel does.
Subcommand add_compose(CLI::App &app, const char *name, const char *description,
                       kelimg::Compose how) {
  struct Options {
    std::string input, overlay, output;
    int32_t x = 0, y = 0;
    uint16_t key = 256;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(name, description);
  add_input(command, o->input);
  add_input(command, o->overlay, "OVERLAY", "picture to put on IN");
  add_output(command, o->output);
  const auto limit = kelimg::kCoordinateLimit;
  command->add_option("--x", o->x, "column of IN where OVERLAY's left edge goes (default 0)")
      ->check(whole_number(-limit, limit));
  command->add_option("--y", o->y, "row of IN where OVERLAY's top edge goes (default 0)")
      ->check(whole_number(-limit, limit));
  command
      ->add_option("--key", o->key,
                   "OVERLAY value that is transparent; above 255 none is (default 256)")
      ->check(whole_number(0, 65535));
  return {command, [o, how] {
            const Picture base = kelimg::load_picture(o->input);
            const Picture overlay = kelimg::load_picture(o->overlay);
            kelimg::save_picture(o->output,
                                 kelimg::compose(base, overlay, o->x, o->y, o->key, how));
          }};
}

// "64x48": both sides 1 to 16383, a canvas that every routine takes.
Picture blank_canvas(const std::string &size, int background) {
  int32_t width = 0, height = 0;
  char separator = 0, rest = 0;
  if (std::sscanf(size.c_str(), "%" SCNd32 "%c%" SCNd32 "%c", &width, &separator, &height, &rest) !=
          3 ||
      separator != 'x' || width < 1 || height < 1 || width > 16383 || height > 16383) {
    throw InputError("--size " + size + ": expected WIDTHxHEIGHT with sides from 1 to 16383");
  }
  return Picture(width, height, static_cast<uint8_t>(background));
}

Subcommand add_draw(CLI::App &app) {
  struct Options {
    std::string pictures[2];  // IN, OUT
    std::string size;
    int background = 0;
    std::vector<std::vector<std::string>> figures =
        std::vector<std::vector<std::string>>(std::size(kelimg::kFigureKinds));
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(
      "draw",
      "Draw lines, triangles, rectangles, circles and numbers onto a picture or a blank canvas");
  command->footer(
      "Figure options may be repeated and are drawn in the order given; every pixel is clipped "
      "to the picture on its own.\nExample: kelimg draw out.png --size 64x48 --background 20 "
      "--rect 0,0,64,48,255 --line 4,43,59,4,200 --circle 31,23,21,255 --number -42,20,36,0");
  command->add_option("IN", o->pictures[0], "picture to draw on; leave it out with --size");
  command->add_option("OUT", o->pictures[1], "picture to write (- for standard output)");
  CLI::Option *size =
      command->add_option("--size", o->size, "draw on a blank canvas this size")->type_name("WxH");
  command->add_option("--background", o->background, "value of the blank canvas (default 0)")
      ->check(whole_number(0, 255))
      ->needs(size);
  std::vector<const CLI::Option *> figure_options;
  for (size_t i = 0; i < std::size(kelimg::kFigureKinds); ++i) {
    const kelimg::FigureKind &kind = kelimg::kFigureKinds[i];
    figure_options.push_back(command->add_option(kind.option, o->figures[i], kind.description)
                                 ->type_name(kind.fields)
                                 ->allow_extra_args(false));
  }
  return {command, [o, command, size, figure_options] {
            // With --size the one picture named is the output, though it fills the IN slot.
            if (*size && o->pictures[1].empty()) std::swap(o->pictures[0], o->pictures[1]);
            if (o->pictures[1].empty() || o->pictures[0].empty() != static_cast<bool>(*size)) {
              throw InputError(*size ? "with --size give only OUT" : "give IN and OUT, or --size");
            }
            // Parse every figure before reading or writing anything.
            std::vector<kelimg::Figure> figures;
            std::vector<size_t> used(figure_options.size());
            for (const CLI::Option *option : command->parse_order()) {
              for (size_t i = 0; i < figure_options.size(); ++i) {
                if (option != figure_options[i]) continue;
                figures.push_back(
                    kelimg::parse_figure(kelimg::kFigureKinds[i], o->figures[i][used[i]++]));
              }
            }
            Picture picture =
                *size ? blank_canvas(o->size, o->background) : kelimg::load_picture(o->pictures[0]);
            for (const kelimg::Figure &figure : figures) kelimg::draw_figure(picture, figure);
            kelimg::save_picture(o->pictures[1], picture);
          }};
}

Subcommand add_convert(CLI::App &app) {
  auto pictures = std::make_shared<Pictures>();
  CLI::App *command = app.add_subcommand(
      "convert", "Read any picture and write it as 8-bit grey in the format OUT's extension names");
  add_pictures(command, *pictures);
  return {command, [pictures] {
            transform_pictures(*pictures, "kelimg convert",
                               [](const Picture &picture, std::string &) { return picture; });
          }};
}

Subcommand add_demo(CLI::App &app) {
  struct Options {
    std::string directory;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(
      "demo",
      "Write a gallery of every routine applied to a built-in test picture, with index.html");
  command->add_option("DIR", o->directory, "directory to write into (created if need be)")
      ->required();
  return {command, [o] {
            const int pictures = kelimg::write_demo(o->directory);
            std::printf("wrote %d pictures and index.html to %s\n", pictures, o->directory.c_str());
          }};
}

std::string version() {
  return "kelimg " + std::to_string(KEL_IMAGES_VERSION_MAJOR) + "." +
         std::to_string(KEL_IMAGES_VERSION_MINOR) + "." + std::to_string(KEL_IMAGES_VERSION_PATCH);
}

}  // namespace

int main(int argc, char **argv) {
  // A reader that goes away (kelimg convert a.png - | head -c 0) is a write error to report,
  // not a signal that ends the tool without a word.
  std::signal(SIGPIPE, SIG_IGN);
  CLI::App app{
      "kelimg: the kel_images routines applied to picture files. Pictures are read as 8-bit "
      "grey and written as 8-bit grey.",
      "kelimg"};
  app.set_version_flag("--version", version(), "print the version and exit");
  app.require_subcommand(1);
  const std::vector<Subcommand> commands = {
      add_stats(app),
      add_rotate(app),
      add_brightness(app, "brighten", "Move every value the given percentage of the way to 255",
                     kelimg::brighten),
      add_brightness(app, "darken", "Move every value the given percentage of the way to 0",
                     kelimg::darken),
      add_mask(app),
      add_fill(app),
      add_compose(app, "paste", "Put OVERLAY onto IN, clipped at IN's edges",
                  kelimg::Compose::paste),
      add_compose(app, "blend", "Average OVERLAY into IN, clipped at IN's edges",
                  kelimg::Compose::blend),
      add_draw(app),
      add_convert(app),
      add_demo(app),
  };
  // Set after the subcommands, which would otherwise take it over.
  app.footer(std::string("Formats in: ") + kelimg::kFormatsIn +
             ".\nFormats out: " + kelimg::kFormatsOut +
             ".\nRun kelimg COMMAND --help for a command's options. Exit status: 0 done, 2 bad "
             "input (nothing written).");

  if (argc < 2) {
    std::fputs(app.help().c_str(), stdout);
    std::fputs("kelimg: give a command (see kelimg --help)\n", stderr);
    return kBadInput;
  }
  const std::string first = argv[1];
  if (first[0] != '-' && std::none_of(commands.begin(), commands.end(), [&](const Subcommand &c) {
        return c.app->get_name() == first;
      })) {
    std::fprintf(stderr, "kelimg: unknown command '%s' (see kelimg --help)\n", first.c_str());
    return kBadInput;
  }

  std::string context = "kelimg";
  try {
    app.parse(argc, argv);
    for (const Subcommand &command : commands) {
      if (!command.app->parsed()) continue;
      context += " " + command.app->get_name();
      command.run();
    }
    return 0;
  } catch (const CLI::ParseError &error) {
    if (error.get_exit_code() == 0) return app.exit(error);  // --help, --version
    for (const Subcommand &command : commands) {
      if (command.app->parsed()) context += " " + command.app->get_name();
    }
    std::fprintf(stderr, "%s: %s (see %s --help)\n", context.c_str(), error.what(),
                 context.c_str());
    return kBadInput;
  } catch (const InputError &error) {
    std::fprintf(stderr, "%s: %s\n", context.c_str(), error.what());
    return kBadInput;
  } catch (const std::bad_alloc &) {
    std::fprintf(stderr, "%s: out of memory (is the picture too large?)\n", context.c_str());
    return kBadInput;
  } catch (const std::exception &error) {
    std::fprintf(stderr, "%s: internal error: %s\n", context.c_str(), error.what());
    return kInternalError;
  }
}
