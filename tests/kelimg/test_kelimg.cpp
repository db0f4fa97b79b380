// End-to-end tests of kelimg. Each row is a shell line run in a fresh directory of pictures made
// here, with the exit status, part of the message and of standard output it must give, and the
// picture it must write: its size and a digest of its pixels. The digests are those of the
// library's routines called directly on the same pixels (a rotation's canvas, a fill, ...).
#include <gtest/gtest.h>
#include <png.h>
#include <stb_image_write.h>
#include <sys/wait.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <string>
#include <vector>

#include "kel_images.h"
#include "picture.h"

namespace {

namespace fs = std::filesystem;
using kelimg::Picture;

struct Case {
  const char *line;  // run by sh in the work directory, with kelimg on the PATH
  int status;
  const char *err;             // part of stderr, which must be one line when the status is 2
  const char *out;             // part of stdout
  const char *file = nullptr;  // the picture the line writes
  const char *picture = "";    // the start of its description: "WIDTHxHEIGHT digest"
  const char *magic = "";      // the file's first bytes
};

// in.png: 41 x 23 with a hole of 0s, described as kIn; other.png: 13 x 9 with a border of 0s
// (transparent under --key 0); hole.png: a mask of in.png's size.
constexpr const char *kIn = "41x23 7eacf88aa90b5f54", *kBrightened = "41x23 00556e17be64d05f";

const Case kCases[] = {
    {"kelimg brighten in.png out.png --percent 30", 0, "", "", "out.png", kBrightened},
    {"kelimg darken in.png out.png --percent 70", 0, "", "", "out.png", "41x23 92935c3f0b5b1a55"},
    {"kelimg mask in.png out.png --key 0", 0, "", "", "out.png", "41x23 1160ca4486071471"},
    {"kelimg mask in.png out.png --key 8 --raw", 0, "", "", "out.png", "41x23 d9576b9336bff0ab"},
    {"kelimg rotate in.png out.png --angle 21", 0, "", "", "out.png", "47x41 939cc0f5a4c20a7e"},
    {"kelimg rotate in.png out.png --deg -90", 0, "",
     "angle 192/256 turn; canvas 24 x 42; the picture's corner (0, 0) is at (0, 41)", "out.png",
     "24x42 f1ef494de1efb3bd"},
    {"kelimg rotate in.png out.png --angle 40 --int8", 0, "", "", "out.png",
     "42x47 b456cd98cf913d4d"},
    {"kelimg rotate in.png out.png --angle 200 --nearest", 0, "", "", "out.png",
     "31x45 0caf4c84fb6016a4"},
    {"kelimg fill in.png out.png --key 0", 0, "", "", "out.png", "41x23 939bc0323140b5bc"},
    {"kelimg fill in.png out.png --mask hole.png", 0, "", "", "out.png", "41x23 1685e15f27f192b9"},
    {"kelimg paste in.png other.png out.png --x -3 --y 17", 0, "", "", "out.png",
     "41x23 e707423f0f4e47c7"},
    {"kelimg blend in.png other.png out.png --x 30 --y -2 --key 0", 0, "", "", "out.png",
     "41x23 97d5a76d61281afb"},
    // Overlapping figures of different colours: the order given is the order drawn.
    {"kelimg draw in.png out.png --rect 2,2,30,15,255 --line -5,20,50,0,0 --circle 20,11,13,128 "
     "--rect 10,4,5,5,60 --triangle 1,1,39,3,20,21,200 --number -307,4,8,90,4",
     0, "", "", "out.png", "41x23 a5cd7786928bc5d2"},
    {"kelimg draw out.png --size 17x6 --background 9 --line 0,0,16,5,250", 0, "", "", "out.png",
     "17x6 159873c944784eda"},
    // The library's figures for in.png, and the true ones, worked out by hand.
    {"kelimg stats in.png --plot plot.png --histogram --bits 2", 0, "",
     "size      41 x 23 (943 pixels)\nlibrary (whole numbers, 32-bit sums):\nmean      102\n"
     "variance  6560\nstd dev   80\n0-63 361\n64-127 205\n128-191 209\n192-255 168\n",
     "plot.png", "288x176 60b8a285d6af4881"},
    {"kelimg stats in.png --exact", 0, "",
     "exact (64-bit sums, by kelimg):\nmean      102.1177\nvariance  6560.3011\nstd dev   "
     "80.9957\n"},
    // Formats out by extension; in from standard input; out through a pipe, a FIFO and a link.
    {"kelimg convert in.png out.pgm", 0, "", "", "out.pgm", kIn, "P5\n41 23\n255\n"},
    {"kelimg convert in.png out.bmp", 0, "", "", "out.bmp", kIn, "BM"},
    {"kelimg convert in.png out.JPG", 0, "", "", "out.JPG", "41x23 ", "\xff\xd8\xff"},
    {"kelimg convert - out.png < in.png", 0, "", "", "out.png", kIn},
    {"kelimg convert in.png - | cat > piped.png", 0, "", "", "piped.png", kIn, "\x89PNG"},
    {"kelimg convert in.png /dev/stdout | cat > piped.png", 0, "", "", "piped.png", kIn},
    {"mkfifo fifo && { timeout 10 cat fifo > piped.png & } && kelimg convert in.png fifo && "
     "wait && test -p fifo",
     0, "", "", "piped.png", kIn},
    {"ln -s real.png link.png && kelimg brighten in.png link.png --percent 30 && test -L link.png",
     0, "", "", "real.png", kBrightened},
    {"kelimg convert colour.png out.png", 0, "colour converted to grey", "", "out.png", kIn},
    {"kelimg convert deep.pgm out.png", 0, "16-bit samples reduced", "", "out.png", kIn},
    {"kelimg convert deep.png out.png", 0, "16-bit samples reduced", "", "out.png", kIn},
    {"kelimg brighten other.png in.png --out-dir done --percent 30 && test -f done/other.png", 0,
     "", "", "done/in.png", kBrightened},
    {"kelimg demo gallery", 0, "", "wrote 24 pictures and index.html to gallery\n",
     "gallery/source.png", "160x120 8db1b1c9314cdec6"},
    {"kelimg --version", 0, "", "kelimg 0."},
    {"kelimg --help", 0, "", "Formats out: PNG (.png"},
    // Bad input: status 2, one line naming the problem, and every file as it was.
    {"kelimg brighten nothing.png out.png --percent 5", 2, "cannot open", ""},
    {"kelimg brighten done out.png --percent 5", 2, "is a directory", ""},
    {"kelimg brighten empty.png out.png --percent 5", 2, "empty", ""},
    {"kelimg brighten truncated.png out.png --percent 5", 2, "cannot decode", ""},
    {"kelimg brighten truncated.pgm out.png --percent 5", 2, "cut short", ""},
    {"kelimg mask corrupt.png in.png --key 1", 2, "cannot decode", ""},
    {"kelimg brighten in.png out.png --percent 5 --bogus", 2, "--bogus", ""},
    {"kelimg", 2, "give a command", "Usage: kelimg"},
    {"kelimg frob in.png", 2, "unknown command 'frob'", ""},
    {"kelimg darken in.png out.png --percent 101", 2, "101 is not in range 0 to 100", ""},
    {"kelimg darken in.png out.png --percent 30.5", 2, "'30.5' is not a whole number", ""},
    {"kelimg darken in.png out.png --percent abc", 2, "'abc' is not a number", ""},
    {"kelimg rotate in.png out.png --deg nan", 2, "'nan' is not a number", ""},
    {"kelimg rotate in.png out.png --deg -inf", 2, "'-inf' is not a finite number", ""},
    {"kelimg rotate in.png out.png --deg 360.5", 2, "--deg: 360.5 is not in range", ""},
    {"kelimg rotate in.png out.png --angle 256", 2, "--angle: 256 is not in range", ""},
    {"kelimg rotate in.png out.png", 2, "angle", ""},
    {"kelimg rotate in.png out.png --angle 1 --int8 --nearest", 2, "excludes", ""},
    {"kelimg mask in.png out.png --key -1", 2, "--key", ""},
    {"kelimg paste in.png in.png out.png --key 65536", 2, "--key", ""},
    {"kelimg draw in.png out.png --line 0,0,5,5,256", 2, "COLOUR", ""},
    {"kelimg draw in.png out.png --circle 1,2", 2, "X,Y,DIAMETER,COLOUR", ""},
    {"kelimg draw in.png out.png --rect 1,2,x,4,5", 2, "whole number", ""},
    {"kelimg draw out.png --size 0x5", 2, "--size", ""},
    {"kelimg rotate wide.png out.png --angle 3", 2, "below 16384", ""},
    {"kelimg fill wider.png out.png --key 0", 2, "65528", ""},
    {"kelimg paste in.png widest.png out.png", 2, "65535", ""},
    {"kelimg fill in.png out.png --mask wide.png", 2, "same size", ""},
    {"kelimg brighten in.png nowhere/out.png --percent 5", 2, "cannot write", ""},
    {"kelimg convert in.png out.tif", 2, "no format is written for '.tif'", ""},
    // A device node of our own that fails every write, so that a regression replaces only it.
    {"{ mknod full c 1 7 2>/dev/null || ln -s /dev/full full; } && kelimg convert in.png full;"
     " s=$?; test -c full && rm full && exit $s",
     2, "No space left on device", ""},
    {"kelimg rotate in.png --angle 3", 2, "give IN and OUT", ""},
    {"kelimg brighten in.png corrupt.png --out-dir done --percent 5", 2, "'corrupt.png'", ""},
    {"kelimg brighten in.png ./in.png --out-dir done --percent 5", 2, "both be written", ""},
    {"kelimg brighten - --out-dir done --percent 5", 2, "standard input", ""},
};

std::string describe(const Picture &picture) {
  uint64_t hash = 0xcbf29ce484222325u;  // FNV-1a
  for (const uint8_t value : picture.pixels) hash = (hash ^ value) * 0x100000001b3u;
  char text[64];
  std::snprintf(text, sizeof text, "%dx%d %016llx", picture.width, picture.height,
                static_cast<unsigned long long>(hash));
  return text;
}

std::string read_text(const fs::path &path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

void write_text(const fs::path &path, const std::string &text) {
  std::ofstream(path, std::ios::binary) << text;
}

// Every file under the work directory with its bytes.
std::map<std::string, std::string> snapshot(const fs::path &root) {
  std::map<std::string, std::string> files;
  for (const auto &entry : fs::recursive_directory_iterator(root)) {
    files[fs::relative(entry.path(), root).string()] =
        entry.is_regular_file() ? read_text(entry.path()) : "";
  }
  return files;
}

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

void make_inputs(const fs::path &work) {
  fs::create_directories(work / "done");
  Picture in = pattern(41, 23), other = pattern(13, 9), hole(41, 23, 1);
  for (int32_t y = 5; y < 14; ++y) std::fill_n(&in.pixels[static_cast<size_t>(y * 41 + 9)], 21, 0);
  kel_image_draw_rectangle(other.data(), 9, 13, 0, 0, 13, 9, 0);
  kel_image_draw_circle(hole.data(), 23, 41, 11, 30, 15, 0);
  const std::pair<const char *, Picture> pictures[] = {{"in.png", in},
                                                       {"other.png", other},
                                                       {"hole.png", hole},
                                                       {"wide.png", Picture(16384, 1, 7)},
                                                       {"wider.png", Picture(65529, 1, 7)},
                                                       {"widest.png", Picture(65536, 1, 7)}};
  for (const auto &[name, picture] : pictures)
    kelimg::save_picture((work / name).string(), picture);
  const std::string png = read_text(work / "in.png");
  write_text(work / "truncated.png", png.substr(0, png.size() / 2));
  write_text(work / "corrupt.png", "\x89PNG\r\n\x1a\n" + std::string(64, '\x5a'));
  write_text(work / "truncated.pgm", "P5 4 4 255\n" + std::string(15, 'x'));
  write_text(work / "empty.png", "");
  // in.png's values as grey RGB, and as 16-bit samples whose low byte is to be dropped, in a
  // PGM (high byte first) and a PNG.
  std::string rgb, pgm = "P5 41 23 65535\n";
  std::vector<uint16_t> deep;
  for (const uint8_t value : in.pixels) {
    rgb.append(3, static_cast<char>(value));
    pgm += {static_cast<char>(value), static_cast<char>(0xab)};
    deep.push_back(static_cast<uint16_t>(value << 8 | 0xab));
  }
  stbi_write_png((work / "colour.png").c_str(), 41, 23, 3, rgb.data(), 41 * 3);
  write_text(work / "deep.pgm", pgm);
  png_image image{};
  image.version = PNG_IMAGE_VERSION;
  image.width = 41;
  image.height = 23;
  image.format = PNG_FORMAT_LINEAR_Y;  // 16-bit samples, written as they are
  png_image_write_to_file(&image, (work / "deep.png").c_str(), 0, deep.data(), 0, nullptr);
}

TEST(Kelimg, EachCommandLineGivesItsStatusMessageAndPicture) {
  const std::string tool = fs::path(KELIMG_PATH).parent_path().string();
  setenv("PATH", (tool + ":" + std::getenv("PATH")).c_str(), 1);
  std::string name = (fs::temp_directory_path() / "kelimg-test-XXXXXX").string();
  ASSERT_NE(mkdtemp(name.data()), nullptr);
  const fs::path root = name, work = root / "work";
  for (const Case &c : kCases) {
    SCOPED_TRACE(c.line);
    fs::remove_all(work);
    make_inputs(work);
    const auto before = snapshot(work);
    const std::string command = "cd '" + work.string() + "' && { " + c.line + "; } >'" +
                                (root / "out").string() + "' 2>'" + (root / "err").string() + "'";
    const int status = std::system(command.c_str());
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), c.status);
    const std::string out = read_text(root / "out"), err = read_text(root / "err");
    EXPECT_NE(out.find(c.out), std::string::npos) << out;
    EXPECT_NE(err.find(c.err), std::string::npos) << err;
    if (c.status != 0) {
      EXPECT_EQ(std::count(err.begin(), err.end(), '\n'), 1) << err;
      EXPECT_EQ(snapshot(work), before);  // no output, no temporary file, nothing changed
      continue;
    }
    EXPECT_TRUE(*c.err != '\0' || err.empty()) << err;
    for (const auto &[file, bytes] : snapshot(work)) {
      EXPECT_NE(fs::path(file).filename().string()[0], '.') << "left behind: " << file;
    }
    if (c.file == nullptr) continue;
    EXPECT_EQ(read_text(work / c.file).rfind(c.magic, 0), 0u);
    Picture got;
    EXPECT_NO_THROW(got = kelimg::load_picture((work / c.file).string()));
    EXPECT_EQ(describe(got).rfind(c.picture, 0), 0u) << describe(got);
  }
  fs::remove_all(root);
}

}  // namespace
