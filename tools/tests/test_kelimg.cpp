// End-to-end tests of kelimg: the built tool runs on pictures made here, and its output is
// compared with the library called directly on the same pixels.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <png.h>
#include <spawn.h>
#include <stb_image_write.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "kel_images.h"
#include "picture.h"

extern char **environ;

namespace {

namespace fs = std::filesystem;
using kelimg::Picture;

// Odd sizes, every value from 1 to 255 and no 0, so that 0 can mark a hole.
Picture pattern(int32_t width, int32_t height) {
  Picture picture(width, height, 0);
  for (int32_t y = 0; y < height; ++y) {
    for (int32_t x = 0; x < width; ++x) {
      picture.pixels[static_cast<size_t>(y * width + x)] =
          static_cast<uint8_t>(1 + (x * 7 + y * 13 + (x * y) % 17) % 255);
    }
  }
  return picture;
}

std::string read_text(const fs::path &path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

void write_text(const fs::path &path, const std::string &text) {
  std::ofstream(path, std::ios::binary) << text;
}

struct Result {
  int status;  // the exit status, or -1 when the tool did not exit normally (a crash)
  std::string out, err;
};

// Each test gets a fresh directory: `work` holds the pictures, so that a test can see exactly
// which files the tool left there; the tool's stdout and stderr go beside it.
class Kelimg : public testing::Test {
 protected:
  void SetUp() override {
    std::string name = (fs::temp_directory_path() / "kelimg-test-XXXXXX").string();
    ASSERT_NE(mkdtemp(name.data()), nullptr);
    root_ = name;
    fs::create_directory(work());
  }
  void TearDown() override { fs::remove_all(root_); }

  fs::path work() const { return root_ / "work"; }
  std::string file(const std::string &name) const { return (work() / name).string(); }
  void write(const std::string &name, const Picture &picture) { save_png(file(name), picture); }
  Picture read(const std::string &name) { return kelimg::load_picture(file(name)); }
  std::set<std::string> files() const {
    std::set<std::string> names;
    for (const auto &entry : fs::directory_iterator(work())) {
      names.insert(entry.path().filename().string());
    }
    return names;
  }

  // Arguments starting with @ name files in the work directory.
  Result run(const std::vector<std::string> &args) {
    std::vector<std::string> words = {KELIMG_PATH};
    for (const std::string &arg : args) words.push_back(arg[0] == '@' ? file(arg.substr(1)) : arg);
    std::vector<char *> argv;
    for (std::string &word : words) argv.push_back(word.data());
    argv.push_back(nullptr);
    const std::string out = (root_ / "stdout").string(), err = (root_ / "stderr").string();
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 1, out.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
    posix_spawn_file_actions_addopen(&actions, 2, err.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
    pid_t pid = 0;
    const int spawned = posix_spawn(&pid, KELIMG_PATH, &actions, nullptr, argv.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    int status = 0;
    if (spawned != 0 || waitpid(pid, &status, 0) != pid) return {-2, "", "spawn failed"};
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, read_text(out), read_text(err)};
  }

 private:
  fs::path root_;
};

uint32_t rows(const Picture &picture) {
  return static_cast<uint32_t>(picture.height);
}
uint32_t cols(const Picture &picture) {
  return static_cast<uint32_t>(picture.width);
}

// The three rotations called directly. Signed pixels are the unsigned ones with the top bit
// flipped, which is value - 128.
Picture rotated(const Picture &in, uint8_t angle, int variant) {
  std::vector<int8_t> flipped(in.pixels.size());
  for (size_t i = 0; i < flipped.size(); ++i) flipped[i] = static_cast<int8_t>(in.pixels[i] ^ 0x80);
  void *canvas = nullptr;
  int32_t height = 0, width = 0, offset_y = 0, offset_x = 0;
  if (variant == 0) {
    uint8_t *pixels = nullptr;
    kel_image_rotate(in.data(), rows(in), cols(in), angle, &pixels, &height, &width, &offset_y,
                     &offset_x);
    canvas = pixels;
  } else {
    int8_t *pixels = nullptr;
    if (variant == 1) {
      kel_image_rotate_int8(flipped.data(), rows(in), cols(in), angle, &pixels, &height, &width,
                            &offset_y, &offset_x);
    } else {
      kel_image_rotate_int8_nn(flipped.data(), in.height, in.width, angle, &pixels, &height, &width,
                               &offset_y, &offset_x);
    }
    canvas = pixels;
  }
  Picture out(width, height, 0);
  const auto *bytes = static_cast<const uint8_t *>(canvas);
  for (size_t i = 0; i < out.pixels.size(); ++i) {
    out.pixels[i] = static_cast<uint8_t>(variant == 0 ? bytes[i] : bytes[i] ^ 0x80);
  }
  std::free(canvas);
  return out;
}

Picture with_hole(Picture picture) {
  for (int32_t y = 5; y < 14; ++y) {
    for (int32_t x = 9; x < 30; ++x) picture.pixels[static_cast<size_t>(y * picture.width + x)] = 0;
  }
  return picture;
}

Picture filled(const Picture &in, const Picture &mask) {
  Picture out(in.width, in.height, 0);
  kel_mask_image(in.data(), static_cast<uint16_t>(in.height), static_cast<uint16_t>(in.width),
                 mask.data(), out.data());
  return out;
}

Picture masked(const Picture &in, int32_t key, uint8_t scale) {
  Picture out(in.width, in.height, 0);
  kel_get_mask(in.data(), rows(in), cols(in), key, out.data());
  for (uint8_t &value : out.pixels) value = static_cast<uint8_t>(value * scale);
  return out;
}

// in.png is a 41 x 23 pattern with a hole of 0s, other.png a 13 x 9 pattern with 0s on its
// border (transparent under --key 0), hole.png a mask of in.png's size.
struct FamilyCase {
  const char *name;
  std::vector<std::string> args;
  std::function<Picture(const Picture &in, const Picture &other, const Picture &hole)> expected;
  const char *says = "";  // what stdout must contain
};

const FamilyCase kFamilies[] = {
    {"brighten",
     {"brighten", "@in.png", "@out.png", "--percent", "30"},
     [](const Picture &in, const Picture &, const Picture &) {
       Picture out(in.width, in.height, 0);
       kel_image_brighten(in.data(), rows(in), cols(in), 30, out.data());
       return out;
     }},
    {"darken",
     {"darken", "@in.png", "@out.png", "--percent", "70"},
     [](const Picture &in, const Picture &, const Picture &) {
       Picture out(in.width, in.height, 0);
       kel_image_darken(in.data(), rows(in), cols(in), 70, out.data());
       return out;
     }},
    {"mask",
     {"mask", "@in.png", "@out.png", "--key", "0"},
     [](const Picture &in, const Picture &, const Picture &) { return masked(in, 0, 255); }},
    {"mask raw",
     {"mask", "@in.png", "@out.png", "--key", "8", "--raw"},
     [](const Picture &in, const Picture &, const Picture &) { return masked(in, 8, 1); }},
    {"rotate",
     {"rotate", "@in.png", "@out.png", "--angle", "21"},
     [](const Picture &in, const Picture &, const Picture &) { return rotated(in, 21, 0); }},
    {"rotate degrees",
     {"rotate", "@in.png", "@out.png", "--deg", "-90"},
     [](const Picture &in, const Picture &, const Picture &) { return rotated(in, 192, 0); },
     "angle 192/256 turn; canvas 24 x 42; the picture's corner (0, 0) is at (0, 41)"},
    {"rotate int8",
     {"rotate", "@in.png", "@out.png", "--angle", "40", "--int8"},
     [](const Picture &in, const Picture &, const Picture &) { return rotated(in, 40, 1); }},
    {"rotate nearest",
     {"rotate", "@in.png", "@out.png", "--angle", "200", "--nearest"},
     [](const Picture &in, const Picture &, const Picture &) { return rotated(in, 200, 2); }},
    {"fill by key",
     {"fill", "@in.png", "@out.png", "--key", "0"},
     [](const Picture &in, const Picture &, const Picture &) {
       return filled(in, masked(in, 0, 1));
     }},
    {"fill by mask",
     {"fill", "@in.png", "@out.png", "--mask", "@hole.png"},
     [](const Picture &in, const Picture &, const Picture &hole) { return filled(in, hole); }},
    {"paste",
     {"paste", "@in.png", "@other.png", "@out.png", "--x", "-3", "--y", "17"},
     [](const Picture &in, const Picture &other, const Picture &) {
       Picture out = in;
       kel_image_draw_image(out.data(), out.height, out.width, other.data(), 9, 13, -3, 17, 256);
       return out;
     }},
    {"blend with key",
     {"blend", "@in.png", "@other.png", "@out.png", "--x", "30", "--y", "-2", "--key", "0"},
     [](const Picture &in, const Picture &other, const Picture &) {
       Picture out = in;
       kel_image_blend_image(out.data(), out.height, out.width, other.data(), 9, 13, 30, -2, 0);
       return out;
     }},
    // Overlapping figures of different colours: the order given is the order drawn.
    {"draw",
     {"draw", "@in.png", "@out.png", "--rect", "2,2,30,15,255", "--line", "-5,20,50,0,0",
      "--circle", "20,11,13,128", "--rect", "10,4,5,5,60", "--triangle", "1,1,39,3,20,21,200",
      "--number", "-307,4,8,90,4"},
     [](const Picture &in, const Picture &, const Picture &) {
       Picture out = in;
       uint8_t *buf = out.data();
       kel_image_draw_rectangle(buf, out.height, out.width, 2, 2, 30, 15, 255);
       kel_image_draw_line(buf, out.height, out.width, -5, 20, 50, 0, 0);
       kel_image_draw_circle(buf, out.height, out.width, 13, 20, 11, 128);
       kel_image_draw_rectangle(buf, out.height, out.width, 10, 4, 5, 5, 60);
       kel_image_draw_triangle(buf, out.height, out.width, 1, 1, 39, 3, 20, 21, 200);
       kel_image_draw_number(buf, out.height, out.width, -307, 4, 4, 8, 90);
       return out;
     }},
    {"draw on a blank canvas",
     {"draw", "@out.png", "--size", "17x6", "--background", "9", "--line", "0,0,16,5,250"},
     [](const Picture &, const Picture &, const Picture &) {
       Picture out(17, 6, 9);
       kel_image_draw_line(out.data(), 6, 17, 0, 0, 16, 5, 250);
       return out;
     }},
};

TEST_F(Kelimg, EachFamilyMatchesTheLibraryCalledDirectly) {
  const Picture in = with_hole(pattern(41, 23));
  Picture other = pattern(13, 9);
  kel_image_draw_rectangle(other.data(), other.height, other.width, 0, 0, 13, 9, 0);
  Picture hole(41, 23, 1);
  kel_image_draw_circle(hole.data(), hole.height, hole.width, 11, 30, 15, 0);
  write("in.png", in);
  write("other.png", other);
  write("hole.png", hole);
  for (const FamilyCase &c : kFamilies) {
    SCOPED_TRACE(c.name);
    const Result result = run(c.args);
    ASSERT_EQ(result.status, 0) << result.err;
    EXPECT_NE(result.out.find(c.says), std::string::npos) << result.out;
    const Picture out = read("out.png");
    const Picture expected = c.expected(in, other, hole);
    EXPECT_EQ(out.width, expected.width);
    EXPECT_EQ(out.height, expected.height);
    EXPECT_EQ(out.pixels, expected.pixels);
    fs::remove(file("out.png"));
  }
}

TEST_F(Kelimg, StatsMatchTheImageStatistics) {
  const Picture in = pattern(41, 23);
  write("in.png", in);
  const Result result =
      run({"stats", "@in.png", "--plot", "@plot.png", "--histogram", "--bits", "2"});
  ASSERT_EQ(result.status, 0) << result.err;
  uint8_t mean = 0;
  const uint16_t variance = kel_image_var(in.data(), in.height, in.width, &mean);
  const uint8_t std_dev = kel_image_std(in.data(), in.height, in.width, nullptr);
  uint32_t bins[4];
  kel_image_histogram_n(in.data(), in.height, in.width, 2, bins);
  std::ostringstream expected;
  expected << "size      41 x 23 (943 pixels)\nmean      " << int{mean} << "\nvariance  "
           << variance << "\nstd dev   " << int{std_dev} << "\n0-63 " << bins[0] << "\n64-127 "
           << bins[1] << "\n128-191 " << bins[2] << "\n192-255 " << bins[3] << "\n";
  EXPECT_EQ(result.out, expected.str());
  const Picture plot = read("plot.png");
  EXPECT_EQ(plot.width, 288);
  EXPECT_EQ(plot.height, 176);
}

TEST_F(Kelimg, ConvertRoundTripsGreyAndReducesColourAndSixteenBits) {
  const Picture grey = pattern(19, 7);
  write("grey.png", grey);
  // The same values as grey RGB, and as 16-bit samples whose low byte is to be dropped, in a
  // PGM (high byte first) and a PNG.
  std::string rgb, pgm = "P5 19 7 65535\n";
  std::vector<uint16_t> deep;
  for (const uint8_t value : grey.pixels) {
    rgb += {static_cast<char>(value), static_cast<char>(value), static_cast<char>(value)};
    pgm += {static_cast<char>(value), static_cast<char>(0xab)};
    deep.push_back(static_cast<uint16_t>(value << 8 | 0xab));
  }
  ASSERT_NE(stbi_write_png(file("colour.png").c_str(), 19, 7, 3, rgb.data(), 19 * 3), 0);
  write_text(file("deep.pgm"), pgm);
  png_image image{};
  image.version = PNG_IMAGE_VERSION;
  image.width = 19;
  image.height = 7;
  image.format = PNG_FORMAT_LINEAR_Y;  // 16-bit samples, written as they are
  ASSERT_NE(png_image_write_to_file(&image, file("deep.png").c_str(), 0, deep.data(), 0, nullptr),
            0);

  const struct {
    const char *input, *note;
  } cases[] = {{"grey.png", ""},
               {"colour.png", "colour converted to grey"},
               {"deep.pgm", "16-bit samples reduced to 8 bits"},
               {"deep.png", "16-bit samples reduced to 8 bits"}};
  for (const auto &c : cases) {
    SCOPED_TRACE(c.input);
    const Result result = run({"convert", std::string("@") + c.input, "@out.png"});
    ASSERT_EQ(result.status, 0) << result.err;
    EXPECT_EQ(result.err.empty(), *c.note == '\0') << result.err;
    EXPECT_NE(result.err.find(c.note), std::string::npos) << result.err;
    const Picture out = read("out.png");
    EXPECT_EQ(out.width, 19);
    EXPECT_EQ(out.pixels, grey.pixels);
  }
}

struct BadCase {
  const char *name;
  std::vector<std::string> args;
  const char *message;  // part of the one line on stderr
};

const BadCase kBadCases[] = {
    {"missing file", {"brighten", "@nothing.png", "@out.png", "--percent", "5"}, "cannot open"},
    {"a directory", {"brighten", "@dir", "@out.png", "--percent", "5"}, "is a directory"},
    {"empty file", {"brighten", "@empty.png", "@out.png", "--percent", "5"}, "empty"},
    {"truncated", {"brighten", "@truncated.png", "@out.png", "--percent", "5"}, "cannot decode"},
    {"truncated PGM", {"brighten", "@truncated.pgm", "@out.png", "--percent", "5"}, "cut short"},
    {"corrupt", {"brighten", "@corrupt.png", "@out.png", "--percent", "5"}, "cannot decode"},
    {"unknown option", {"brighten", "@in.png", "@out.png", "--percent", "5", "--bogus"}, "--bogus"},
    {"no command", {}, "subcommand"},
    {"percent out of range", {"darken", "@in.png", "@out.png", "--percent", "101"}, "--percent"},
    {"angle out of range", {"rotate", "@in.png", "@out.png", "--angle", "256"}, "--angle"},
    {"no angle", {"rotate", "@in.png", "@out.png"}, "angle"},
    {"int8 and nearest",
     {"rotate", "@in.png", "@out.png", "--angle", "1", "--int8", "--nearest"},
     "excludes"},
    {"key out of range", {"mask", "@in.png", "@out.png", "--key", "-1"}, "--key"},
    {"paste key out of range",
     {"paste", "@in.png", "@in.png", "@out.png", "--key", "65536"},
     "--key"},
    {"colour out of range", {"draw", "@in.png", "@out.png", "--line", "0,0,5,5,256"}, "COLOUR"},
    {"figure fields", {"draw", "@in.png", "@out.png", "--circle", "1,2"}, "X,Y,DIAMETER,COLOUR"},
    {"figure number", {"draw", "@in.png", "@out.png", "--rect", "1,2,x,4,5"}, "whole number"},
    {"canvas size", {"draw", "@out.png", "--size", "0x5"}, "--size"},
    {"rotation side", {"rotate", "@wide.png", "@out.png", "--angle", "3"}, "below 16384"},
    {"fill side", {"fill", "@wider.png", "@out.png", "--key", "0"}, "65528"},
    {"overlay side", {"paste", "@in.png", "@widest.png", "@out.png"}, "65535"},
    {"mask size", {"fill", "@in.png", "@out.png", "--mask", "@wide.png"}, "same size"},
    {"output directory",
     {"brighten", "@in.png", "@nowhere/out.png", "--percent", "5"},
     "cannot write"},
};

TEST_F(Kelimg, BadInputExitsWithTwoAndWritesNothing) {
  write("in.png", pattern(5, 4));
  write("wide.png", Picture(16384, 1, 7));
  write("wider.png", Picture(65529, 1, 7));
  write("widest.png", Picture(65536, 1, 7));
  const std::string png = read_text(file("in.png"));
  write_text(file("truncated.png"), png.substr(0, png.size() / 2));
  write_text(file("corrupt.png"), "\x89PNG\r\n\x1a\n" + std::string(64, '\x5a'));
  write_text(file("truncated.pgm"), "P5 4 4 255\n" + std::string(15, 'x'));
  write_text(file("empty.png"), "");
  fs::create_directory(file("dir"));
  const std::set<std::string> inputs = files();

  for (const BadCase &c : kBadCases) {
    SCOPED_TRACE(c.name);
    const Result result = run(c.args);
    EXPECT_EQ(result.status, 2);
    EXPECT_NE(result.err.find(c.message), std::string::npos) << result.err;
    EXPECT_EQ(std::count(result.err.begin(), result.err.end(), '\n'), 1) << result.err;
    EXPECT_EQ(files(), inputs);  // no output, no temporary file
  }
}

TEST_F(Kelimg, FailureLeavesAnExistingOutputAsItWas) {
  write_text(file("corrupt.png"), "not a picture");
  write_text(file("out.png"), "old");
  EXPECT_EQ(run({"mask", "@corrupt.png", "@out.png", "--key", "1"}).status, 2);
  EXPECT_EQ(read_text(file("out.png")), "old");
}

TEST_F(Kelimg, DemoWritesEveryPictureItsIndexShows) {
  const Result result = run({"demo", "@gallery"});
  ASSERT_EQ(result.status, 0) << result.err;
  const std::string html = read_text(work() / "gallery" / "index.html");
  size_t shown = 0;
  for (size_t at = html.find("<img src=\""); at != std::string::npos;
       at = html.find("<img src=\"", at + 1)) {
    const size_t start = at + 10;
    const std::string name = html.substr(start, html.find('"', start) - start);
    EXPECT_GT(read("gallery/" + name).pixel_count(), 0) << name;
    ++shown;
  }
  EXPECT_GE(shown, 20u);
  EXPECT_EQ(result.out, "wrote " + std::to_string(shown) + " pictures and index.html to " +
                            file("gallery") + "\n");
}

}  // namespace
