// End-to-end tests of kelimg. Each row is a shell line run in a fresh directory of pictures made
// here, with the exit status, part of the message and of standard output it must give, and the
// picture it must write: its size and a digest of its pixels. The digests are those of the
// library's routines called directly on the same pixels (a rotation's canvas, a fill, ...).
// Then every input format, whole and cut short, through the reader itself.
#include <gtest/gtest.h>
#include <png.h>
#include <stb_image_write.h>
#include <sys/wait.h>
#include <unistd.h>
#include <zlib.h>

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
// (transparent under --key 0); hole.png: a mask of in.png's size. $DATA holds what is too large
// to make for every row: bomb.png, 875 KB that inflate to 30000 x 30000, and big.png, 8000 x
// 8000. $AS_OTHER runs a command as a user without root's right to write anything (nobody), so
// that permissions count.
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
    {"kelimg convert colour.png out.png", 0, "colour converted to grey", "", "out.png",
     "41x23 759b15cac6bb293e"},
    // Grey in colour formats is no colour; an opaque alpha channel loses nothing.
    {"kelimg convert grey.bmp out.png && kelimg convert grey.gif out2.png && cmp out.png out2.png",
     0, "", "", "out.png", kIn},
    // 16-bit and other Netpbm samples are scaled from their largest value, rounding to nearest.
    {"kelimg convert deep.pgm out.png", 0, "16-bit samples reduced", "", "out.png", kIn},
    {"kelimg convert deep.png out.png", 0, "16-bit samples reduced", "", "out.png", kIn},
    {"kelimg convert twelve.pgm out.png", 0, "16-bit samples reduced", "", "out.png", kIn},
    {"printf 'P5 4 1 15\\n\\0\\5\\12\\17' | kelimg convert - out.pgm && od -An -tu1 -j11 out.pgm",
     0, "", " 0  85 170 255", "out.pgm", "4x1 "},
    {"kelimg brighten other.png in.png --out-dir done --percent 30 && test -f done/other.png", 0,
     "", "", "done/in.png", kBrightened},
    {"kelimg demo gallery", 0, "", "wrote 24 pictures and index.html to gallery\n",
     "gallery/source.png", "160x120 8db1b1c9314cdec6"},
    // A replaced file keeps its mode and its other names; a name of 255 bytes can be replaced;
    // a file writable in a directory that is not is written in place, as cp writes it.
    {"chmod 600 in.png && kelimg brighten in.png in.png --percent 30 && stat -c %a in.png", 0, "",
     "600", "in.png", kBrightened},
    {"ln in.png link && kelimg brighten in.png in.png --percent 30 && rm in.png && mv link in.png",
     0, "", "", "in.png", kBrightened},
    {"n=$(printf %0251d 0).png && kelimg brighten in.png $n --percent 30 && mv $n out.png", 0, "",
     "", "out.png", kBrightened},
    {"$AS_OTHER kelimg brighten in.png locked/open.png --percent 30", 0, "", "", "locked/open.png",
     kBrightened},
    {"kelimg --max-pixels 943 convert in.png out.png && kelimg convert in.png out.pgm "
     "--max-bytes 100000",
     0, "", "", "out.pgm", kIn},
    {"kelimg --version", 0, "", "kelimg 0."},
    {"kelimg --help", 0, "", "Formats out: PNG (.png"},
    // Bad input: status 2, one line naming the problem, and every file as it was.
    {"kelimg brighten nothing.png out.png --percent 5", 2, "cannot open", ""},
    {"kelimg brighten done out.png --percent 5", 2, "is a directory", ""},
    {"kelimg brighten empty.png out.png --percent 5", 2, "empty", ""},
    {"kelimg brighten truncated.png out.png --percent 5", 2, "cannot decode", ""},
    {"kelimg brighten truncated.pgm out.png --percent 5", 2, "cut short", ""},
    {"kelimg brighten truncated.jpg out.png --percent 5", 2, "the JPEG is cut short", ""},
    {"kelimg convert high.pgm out.png", 2, "has a sample of 16 above its largest value (maxval) 15",
     ""},
    {"kelimg paste - - out.png < in.png", 2, "standard input (-) is named twice", ""},
    // Hostile input ends at once: a deflate bomb at its header, endless streams after 64 KiB.
    {"timeout 20 kelimg convert \"$DATA/bomb.png\" out.png", 2,
     "30000 x 30000 pixels, more than the 268435456 that kelimg decodes (--max-pixels)", ""},
    {"ln -s /dev/zero zero.png && timeout 20 kelimg convert zero.png out.png; s=$?; rm zero.png; "
     "exit $s",
     2, "'zero.png': it is not a picture in a format kelimg reads", ""},
    {"timeout 20 kelimg convert - out.png < /dev/urandom", 2, "standard input: it is not a picture",
     ""},
    {"kelimg convert in.png out.png --max-pixels 942", 2, "more than the 942", ""},
    {"kelimg convert in.png out.png --max-bytes 100", 2,
     "bytes, more than the 100 bytes that kelimg reads (--max-bytes)", ""},
    {"cat in.png | kelimg convert - out.png --max-bytes 100", 2, "it holds more than the 100 bytes",
     ""},
    // No memory for the fill's scratch is an error, not a black picture (the sizes leave room for
    // the picture and its mask, not for the scratch of twice the picture).
    {"ulimit -v 250000 && kelimg fill \"$DATA/big.png\" out.png --key 0", 2, "out of memory", ""},
    // A file the user may not write is refused, as cp refuses it; so is a new file in a directory
    // they may not write.
    {"$AS_OTHER kelimg brighten in.png readonly.png --percent 5", 2,
     "cannot write 'readonly.png': Permission denied", ""},
    {"$AS_OTHER kelimg brighten in.png locked/new.png --percent 5", 2, "Permission denied", ""},
    // A batch ended by a signal leaves no temporary file behind (the shell starts background
    // jobs ignoring SIGINT, which env undoes).
    {"kelimg draw big.png --size 1200x1200 --circle 600,600,1100,200 && mkdir batch && for i in "
     "1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16; do cp big.png batch/$i.png; done && rm big.png && "
     "for s in TERM INT; do { env --default-signal=INT kelimg brighten batch/*.png --out-dir done "
     "--percent 9 & } && i=0 && until ls -A done | grep -q '^[.]' || [ $i -gt 2000 ]; do sleep "
     "0.01; i=$((i + 1)); done; kill -$s $!; wait $! 2>/dev/null; printf \"%s \" $? >&2; done; "
     "rm -r batch; echo ends >&2; exit 2",
     2, "143 130 ends", ""},
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

std::string be16(uint32_t value) {
  return {static_cast<char>(value >> 8), static_cast<char>(value)};
}
std::string be32(uint32_t value) {
  return be16(value >> 16) + be16(value & 0xffff);
}
std::string le16(uint32_t value) {
  return {static_cast<char>(value), static_cast<char>(value >> 8)};
}

// A GIF of 256 greys whose LZW codes are all literals: a clear code every 250 keeps them 9 bits.
std::string gif_of(const Picture &picture) {
  std::string gif =
      "GIF89a" + le16(picture.width) + le16(picture.height) + "\xf7" + std::string(2, 0);
  for (int value = 0; value < 256; ++value) gif.append(3, static_cast<char>(value));
  gif += "," + le16(0) + le16(0) + le16(picture.width) + le16(picture.height) + std::string(1, 0) +
         "\x08";
  std::string codes;
  uint32_t bits = 0, count = 0;
  const auto put = [&](uint32_t code) {
    for (bits |= code << count, count += 9; count >= 8; bits >>= 8, count -= 8) {
      codes += static_cast<char>(bits);
    }
  };
  for (size_t i = 0; i < picture.pixels.size(); ++i) {
    if (i % 250 == 0) put(256);
    put(picture.pixels[i]);
  }
  put(257);
  if (count > 0) codes += static_cast<char>(bits);
  for (size_t at = 0; at < codes.size(); at += 255) {
    const std::string block = codes.substr(at, 255);
    gif += static_cast<char>(block.size()) + block;
  }
  return gif + std::string(1, 0) + ";";
}

std::string stb_written(int (*write)(stbi_write_func *, void *, int, int, int, const void *),
                        const Picture &picture) {
  std::string bytes;
  write(
      [](void *to, void *data, int size) {
        static_cast<std::string *>(to)->append(static_cast<char *>(data),
                                               static_cast<size_t>(size));
      },
      &bytes, picture.width, picture.height, 1, picture.data());
  return bytes;
}

// A PNG of 30000 x 30000 zeros in 878 KB: after a full flush, deflate writes the same bytes for
// the same rows, so one deflated block of 100 rows is repeated 300 times.
void write_bomb(const fs::path &path) {
  constexpr uint32_t kSide = 30000, kRows = 100;
  std::vector<uint8_t> rows(size_t{kRows} * (kSide + 1), 0);  // each row: filter 0, then pixels
  std::vector<uint8_t> out(rows.size());
  z_stream z{};
  deflateInit(&z, 9);
  z.next_in = rows.data();
  z.avail_in = static_cast<uInt>(rows.size());
  z.next_out = out.data();
  z.avail_out = static_cast<uInt>(out.size());
  deflate(&z, Z_FULL_FLUSH);
  const std::string first(out.begin(), out.begin() + static_cast<long>(out.size() - z.avail_out));
  deflateEnd(&z);
  uLong adler = adler32(0, rows.data(), static_cast<uInt>(rows.size())), total = adler;
  for (uint32_t i = 1; i < kSide / kRows; ++i)
    total = adler32_combine(total, adler, static_cast<long>(rows.size()));
  std::string data = first;
  for (uint32_t i = 1; i < kSide / kRows; ++i) data += first.substr(2);  // without the zlib header
  data += "\x03" + std::string(1, 0) + be32(static_cast<uint32_t>(total));  // final empty block
  const auto chunk = [](const std::string &type, const std::string &body) {
    const std::string typed = type + body;
    const auto *bytes = reinterpret_cast<const Bytef *>(typed.data());
    return be32(static_cast<uint32_t>(body.size())) + typed +
           be32(static_cast<uint32_t>(crc32(0, bytes, static_cast<uInt>(typed.size()))));
  };
  write_text(path, "\x89PNG\r\n\x1a\n" +
                       chunk("IHDR", be32(kSide) + be32(kSide) + "\x08" + std::string(4, 0)) +
                       chunk("IDAT", data) + chunk("IEND", ""));
}

void make_data(const fs::path &data) {
  fs::create_directories(data);
  write_bomb(data / "bomb.png");
  Picture big(8000, 8000, 100);
  kel_image_draw_circle(big.data(), 8000, 8000, 300, 4000, 4000, 0);
  kelimg::save_picture((data / "big.png").string(), big);
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
  write_text(work / "high.pgm", "P5 2 1 15\n\x0f\x10");
  write_text(work / "empty.png", "");
  kelimg::save_picture((work / "truncated.jpg").string(), in);
  fs::resize_file(work / "truncated.jpg", fs::file_size(work / "truncated.jpg") - 300);
  // in.png's values in colour, as grey RGB and a palette of greys, and as 16-bit or 12-bit
  // samples that round to them, in PGMs (high byte first) and a PNG.
  std::string colour, grey, pgm = "P5 41 23 65535\n", twelve = "P5 41 23 4095\n";
  std::vector<uint16_t> deep;
  for (const uint8_t value : in.pixels) {
    colour += {static_cast<char>(value), static_cast<char>(value / 2), static_cast<char>(~value)};
    grey.append(3, static_cast<char>(value));
    const auto sample = static_cast<uint16_t>(value * 257 + (value < 128 ? 112 : -112));
    pgm += be16(sample);
    twelve += be16((value * 4095u + 127) / 255);
    deep.push_back(sample);
  }
  stbi_write_png((work / "colour.png").c_str(), 41, 23, 3, colour.data(), 41 * 3);
  stbi_write_bmp((work / "grey.bmp").c_str(), 41, 23, 3, grey.data());
  write_text(work / "grey.gif", gif_of(in));
  write_text(work / "deep.pgm", pgm);
  write_text(work / "twelve.pgm", twelve);
  // A file nobody may write, and one anybody may write in a directory that nobody may.
  kelimg::save_picture((work / "readonly.png").string(), in);
  fs::permissions(work / "readonly.png", fs::perms(0444));
  fs::create_directories(work / "locked");
  kelimg::save_picture((work / "locked/open.png").string(), in);
  fs::permissions(work / "locked/open.png", fs::perms(0666));
  fs::permissions(work / "locked", fs::perms(0555));
  png_image image{};
  image.version = PNG_IMAGE_VERSION;
  image.width = 41;
  image.height = 23;
  image.format = PNG_FORMAT_LINEAR_Y;  // 16-bit samples, written as they are
  png_image_write_to_file(&image, (work / "deep.png").c_str(), 0, deep.data(), 0, nullptr);
}

TEST(Kelimg, EachCommandLineGivesItsStatusMessageAndPicture) {
  std::string name = (fs::temp_directory_path() / "kelimg-test-XXXXXX").string();
  ASSERT_NE(mkdtemp(name.data()), nullptr);
  const fs::path root = name, work = root / "work";
  // Root may write anything; nobody may write only what permissions allow, as any user. The tool
  // is copied where nobody can run it, whatever the build directory's permissions.
  setenv("AS_OTHER", geteuid() == 0 ? "setpriv --reuid=65534 --regid=65534 --clear-groups" : "", 1);
  fs::permissions(root, fs::perms(0755));
  fs::create_directories(root / "bin");
  fs::copy_file(KELIMG_PATH, root / "bin" / "kelimg");
  setenv("PATH", ((root / "bin").string() + ":" + std::getenv("PATH")).c_str(), 1);
  make_data(root / "data");
  setenv("DATA", (root / "data").c_str(), 1);
  for (const Case &c : kCases) {
    SCOPED_TRACE(c.line);
#if defined(__SANITIZE_ADDRESS__)
    // AddressSanitizer reserves terabytes of address space, which ulimit -v forbids.
    if (std::string(c.line).find("ulimit -v") != std::string::npos) continue;
#endif
    fs::remove_all(work);
    make_inputs(work);
    fs::permissions(work, fs::perms(0777));
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

std::string refusal(const fs::path &path) {
  try {
    kelimg::load_picture(path.string());
  } catch (const kelimg::InputError &error) {
    return error.what();
  }
  return "read";
}

// Every format kelimg reads, whole, and cut short at three places: within the header or early
// data, in the middle, and 5 bytes before the end. Lossless encodings give the picture back.
TEST(Kelimg, EveryFormatIsReadWholeAndRefusedCutShort) {
  const Picture picture = pattern(41, 23);
  const fs::path work = fs::temp_directory_path() / ("kelimg-formats-" + std::to_string(getpid()));
  fs::create_directories(work);
  std::string ppm = "P6 41 23 255\n", psd_planes, pic = "\x53\x80\xf6\x34" + std::string(84, 0);
  for (const uint8_t value : picture.pixels) ppm.append(3, static_cast<char>(value));
  for (int plane = 0; plane < 3; ++plane)
    psd_planes.append(picture.pixels.begin(), picture.pixels.end());
  // One packet: not chained, 8 bits, uncompressed, red, green and blue.
  pic += "PICT" + be16(41) + be16(23) + std::string(8, 0) + std::string("\x00\x08\x00\xe0", 4);
  for (const uint8_t value : picture.pixels) pic.append(3, static_cast<char>(value));
  const std::string psd = "8BPS" + be16(1) + std::string(6, 0) + be16(3) + be32(23) + be32(41) +
                          be16(8) + be16(3) + std::string(14, 0) + psd_planes;
  std::vector<float> light(picture.pixels.begin(), picture.pixels.end());
  std::string hdr;
  stbi_write_hdr_to_func(
      [](void *to, void *data, int size) {
        static_cast<std::string *>(to)->append(static_cast<char *>(data),
                                               static_cast<size_t>(size));
      },
      &hdr, 41, 23, 1, light.data());
  stbi_write_tga_with_rle = 0;
  const std::string tga = stb_written(stbi_write_tga_to_func, picture);
  stbi_write_tga_with_rle = 1;
  const std::string tga_rle = stb_written(stbi_write_tga_to_func, picture);
  const std::pair<const char *, std::string> kFormats[] = {
      {"a.png", ""},  {"a.jpg", ""},        {"a.bmp", ""},
      {"a.pgm", ""},  {"a.ppm", ppm},       {"a.gif", gif_of(picture)},
      {"a.tga", tga}, {"rle.tga", tga_rle}, {"a.psd", psd},
      {"a.hdr", hdr}, {"a.pic", pic}};
  for (const auto &[file, bytes] : kFormats) {
    SCOPED_TRACE(file);
    const fs::path path = work / file;
    if (bytes.empty()) {
      kelimg::save_picture(path.string(), picture);
    } else {
      write_text(path, bytes);
    }
    const std::string whole = read_text(path);
    EXPECT_EQ(refusal(path), "read");
    const Picture got = kelimg::load_picture(path.string());
    const bool lossy = fs::path(file).extension() == ".jpg" || fs::path(file).extension() == ".hdr";
    EXPECT_EQ(lossy ? describe(got).substr(0, 5) : describe(got),
              lossy ? "41x23" : describe(picture));
    for (const size_t cut : {whole.size() / 3, whole.size() * 2 / 3, whole.size() - 5}) {
      write_text(path, whole.substr(0, cut));
      EXPECT_NE(refusal(path).find("cut short (truncated)"), std::string::npos)
          << cut << ": " << refusal(path);
    }
  }
  fs::remove_all(work);
}
