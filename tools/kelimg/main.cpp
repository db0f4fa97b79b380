// kelimg: the kel_images routines applied to picture files from the command line.
//
// Every subcommand reads its pictures, checks what the routine needs of them, calls the library
// and only then writes its output, so bad input ends with a one-line message on stderr, exit
// status 2 and no output file.
#include <CLI/CLI.hpp>
#include <cinttypes>
#include <cstdio>
#include <functional>
#include <iterator>
#include <memory>
#include <new>
#include <string>
#include <vector>

#include "demo.h"
#include "figures.h"
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

void add_input(CLI::App *command, std::string &path, const char *name = "IN",
               const char *description = "picture to read (PNG, JPEG, BMP, PGM, ...)") {
  command->add_option(name, path, description)->required();
}

void add_output(CLI::App *command, std::string &path) {
  command->add_option("OUT", path, "PNG to write (8-bit grey)")->required();
}

Subcommand add_stats(CLI::App &app) {
  struct Options {
    std::string input, plot;
    bool histogram = false;
    uint32_t bits = 8;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(
      "stats", "Print the mean, variance and standard deviation of a picture's values");
  add_input(command, o->input);
  command->add_option("--plot", o->plot, "also draw the histogram into this PNG")
      ->type_name("FILE");
  CLI::Option *histogram =
      command->add_flag("--histogram", o->histogram, "also print the histogram, one bin a line");
  command
      ->add_option("--bits", o->bits,
                   "bin the histogram by the top BITS bits of each value (2^BITS bins)")
      ->check(CLI::Range(0, 8))
      ->needs(histogram);
  return {command, [o] {
            const Picture picture = kelimg::load_picture(o->input);
            const kelimg::Statistics stats = kelimg::statistics(picture);
            if (!o->plot.empty()) kelimg::save_png(o->plot, kelimg::plot_histogram(stats));
            std::printf("size      %" PRId32 " x %" PRId32 " (%" PRIu32 " pixels)\n", picture.width,
                        picture.height, stats.count);
            std::printf("mean      %u\nvariance  %u\nstd dev   %u\n", stats.mean, stats.variance,
                        stats.std_dev);
            if (stats.mean_wrapped || stats.variance_wrapped) {
              std::fprintf(stderr,
                           "kelimg stats: warning: the %s sum passed 32 bits and wrapped, as the "
                           "library's sums do; the figures are those of the wrapped sums\n",
                           stats.mean_wrapped ? "intensity" : "squared deviation");
            }
            if (!o->histogram) return;
            const std::vector<uint32_t> bins = kelimg::reduced_histogram(picture, o->bits);
            const uint32_t span = 256u >> o->bits;
            for (uint32_t bin = 0; bin < bins.size(); ++bin) {
              if (span == 1) {
                std::printf("%u %" PRIu32 "\n", bin, bins[bin]);
              } else {
                std::printf("%u-%u %" PRIu32 "\n", bin * span, bin * span + span - 1, bins[bin]);
              }
            }
          }};
}

Subcommand add_rotate(CLI::App &app) {
  struct Options {
    std::string input, output;
    int angle = 0;
    double degrees = 0;
    bool int8 = false, nearest = false;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(
      "rotate",
      "Turn a picture clockwise onto a canvas just large enough for it; prints the canvas size "
      "and where the picture's corner (0, 0) landed");
  add_input(command, o->input);
  add_output(command, o->output);
  CLI::Option_group *angle = command->add_option_group("angle", "exactly one of");
  CLI::Option *units = angle->add_option("--angle", o->angle, "angle in 1/256 turns (64 = 90°)")
                           ->check(CLI::Range(0, 255));
  angle->add_option("--deg", o->degrees, "angle in degrees, rounded to 1/256 turns")
      ->check(CLI::Range(-360.0, 360.0));
  angle->require_option(1);
  CLI::Option *int8 = command->add_flag(
      "--int8", o->int8,
      "rotate as signed pixels (value - 128), bilinear; uncovered pixels become 128");
  command
      ->add_flag("--nearest", o->nearest,
                 "rotate as signed pixels, nearest neighbour; uncovered pixels become 0")
      ->excludes(int8);
  return {command, [o, units] {
            const Picture picture = kelimg::load_picture(o->input);
            const uint8_t turn =
                *units ? static_cast<uint8_t>(o->angle) : kelimg::degrees_to_angle(o->degrees);
            const kelimg::Resampling resampling =
                o->nearest
                    ? kelimg::Resampling::nearest_int8
                    : (o->int8 ? kelimg::Resampling::bilinear_int8 : kelimg::Resampling::bilinear);
            const kelimg::Rotated rotated = kelimg::rotate(picture, turn, resampling);
            kelimg::save_png(o->output, rotated.canvas);
            std::printf("angle %u/256 turn; canvas %" PRId32 " x %" PRId32
                        "; the picture's corner (0, 0) is at (%" PRId32 ", %" PRId32 ")\n",
                        turn, rotated.canvas.width, rotated.canvas.height, rotated.offset_x,
                        rotated.offset_y);
          }};
}

// brighten and darken differ only in the direction they move the values.
Subcommand add_brightness(CLI::App &app, const char *name, const char *description,
                          Picture (*operation)(const Picture &, uint32_t)) {
  struct Options {
    std::string input, output;
    uint32_t percent = 0;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(name, description);
  add_input(command, o->input);
  add_output(command, o->output);
  command->add_option("--percent", o->percent, "how far to move every value, 0 to 100")
      ->required()
      ->check(CLI::Range(0, 100));
  return {command, [o, operation] {
            kelimg::save_png(o->output, operation(kelimg::load_picture(o->input), o->percent));
          }};
}

Subcommand add_mask(CLI::App &app) {
  struct Options {
    std::string input, output;
    int key = 0;
    bool raw = false;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command = app.add_subcommand(
      "mask", "Make a mask: 0 where the picture holds the key value, 255 (or 1) elsewhere");
  add_input(command, o->input);
  add_output(command, o->output);
  command->add_option("--key", o->key, "the value to mark")->required()->check(CLI::Range(0, 255));
  command->add_flag("--raw", o->raw, "write the library's 0/1 values instead of 0/255");
  return {command, [o] {
            kelimg::save_png(o->output,
                             kelimg::mask(kelimg::load_picture(o->input), o->key, !o->raw));
          }};
}

Subcommand add_fill(CLI::App &app) {
  struct Options {
    std::string input, output, mask;
    int key = 0;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command =
      app.add_subcommand("fill", "Fill a hole in a picture smoothly from the values around it");
  add_input(command, o->input);
  add_output(command, o->output);
  CLI::Option_group *hole = command->add_option_group("hole", "exactly one of");
  CLI::Option *key = hole->add_option("--key", o->key, "the hole is every pixel holding this value")
                         ->check(CLI::Range(0, 255));
  hole->add_option("--mask", o->mask,
                   "the hole is every pixel where this picture (same size) holds 0")
      ->type_name("FILE");
  hole->require_option(1);
  return {command, [o, key] {
            const Picture picture = kelimg::load_picture(o->input);
            const Picture hole_mask =
                *key ? kelimg::mask(picture, o->key, false) : kelimg::load_picture(o->mask);
            kelimg::save_png(o->output, kelimg::fill(picture, hole_mask));
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
      ->check(CLI::Range(-limit, limit));
  command->add_option("--y", o->y, "row of IN where OVERLAY's top edge goes (default 0)")
      ->check(CLI::Range(-limit, limit));
  command
      ->add_option("--key", o->key,
                   "OVERLAY value that is transparent; above 255 none is (default 256)")
      ->check(CLI::Range(0, 65535));
  return {command, [o, how] {
            const Picture base = kelimg::load_picture(o->input);
            const Picture overlay = kelimg::load_picture(o->overlay);
            kelimg::save_png(o->output, kelimg::compose(base, overlay, o->x, o->y, o->key, how));
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
  command->add_option("OUT", o->pictures[1], "PNG to write (8-bit grey)");
  CLI::Option *size =
      command->add_option("--size", o->size, "draw on a blank canvas this size")->type_name("WxH");
  command->add_option("--background", o->background, "value of the blank canvas (default 0)")
      ->check(CLI::Range(0, 255))
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
            kelimg::save_png(o->pictures[1], picture);
          }};
}

Subcommand add_convert(CLI::App &app) {
  struct Options {
    std::string input, output;
  };
  auto o = std::make_shared<Options>();
  CLI::App *command =
      app.add_subcommand("convert", "Read any picture and write it as an 8-bit grey PNG");
  add_input(command, o->input);
  add_output(command, o->output);
  return {command, [o] { kelimg::save_png(o->output, kelimg::load_picture(o->input)); }};
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

}  // namespace

int main(int argc, char **argv) {
  CLI::App app{
      "kelimg: the kel_images routines applied to picture files. Pictures are read as 8-bit "
      "grey and written as 8-bit grey PNG.",
      "kelimg"};
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
  app.footer(
      "Run kelimg COMMAND --help for a command's options. Exit status: 0 done, 2 bad "
      "input (nothing written).");

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
    if (error.get_exit_code() == 0) return app.exit(error);  // --help
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
