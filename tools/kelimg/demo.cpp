#include "demo.h"

#include <filesystem>
#include <vector>

#include "figures.h"
#include "operations.h"

namespace kelimg {
namespace {

constexpr int32_t kWidth = 160, kHeight = 120;

Picture canvas_with(int32_t width, int32_t height, uint8_t background,
                    const std::vector<Figure> &figures) {
  Picture picture(width, height, background);
  for (const Figure &figure : figures) draw_figure(picture, figure);
  return picture;
}

std::string draw_command(const std::string &name, int32_t width, int32_t height, uint8_t background,
                         const std::vector<Figure> &figures) {
  std::string command = "kelimg draw " + name + " --size " + std::to_string(width) + "x" +
                        std::to_string(height) + " --background " + std::to_string(background);
  for (const Figure &figure : figures) command += " " + format_figure(figure);
  return command;
}

// A copy of the test picture with scribbles and a block of 0, the value the fill repairs.
Picture damaged(const Picture &source) {
  Picture picture = source;
  for (int32_t offset = -3; offset <= 3; ++offset) {
    draw_figure(picture, line(14, 104 + offset, 146, 24 + offset, 0));
    draw_figure(picture, rectangle(104 + offset + 3, 74, 1, 22, 0));
    draw_figure(picture, rectangle(104 + offset + 10, 74, 1, 22, 0));
  }
  return picture;
}

// The overlay for paste and blend: figures on 0, the key that makes the rest transparent.
Picture sticker() {
  Picture picture(48, 40, 0);
  // Nested outlines make a solid frame.
  for (int32_t inset = 0; inset < 5; ++inset) {
    draw_figure(picture, rectangle(inset, inset, 48 - 2 * inset, 40 - 2 * inset, 255));
  }
  draw_figure(picture, circle(23, 19, 21, 200));
  draw_figure(picture, number(7, 22, 16, 200));
  return picture;
}

struct Entry {
  std::string name;
  Picture picture;
  std::string caption;
  std::string command;
};

struct Section {
  std::string title;
  std::vector<Entry> entries;
};

std::string rotation_caption(const Rotated &rotated, const char *kind) {
  return std::string(kind) + "; canvas " + std::to_string(rotated.canvas.width) + " x " +
         std::to_string(rotated.canvas.height) + ", source corner at (" +
         std::to_string(rotated.offset_x) + ", " + std::to_string(rotated.offset_y) + ")";
}

Section rotations(const Picture &source) {
  struct Case {
    uint8_t angle;
    Resampling resampling;
    const char *file, *option, *kind;
  };
  const Case cases[] = {
      {16, Resampling::bilinear, "rotate_016.png", "", "bilinear, 255 where uncovered"},
      {32, Resampling::bilinear, "rotate_032.png", "", "bilinear, 255 where uncovered"},
      {64, Resampling::bilinear, "rotate_064.png", "", "a quarter turn"},
      {176, Resampling::bilinear, "rotate_176.png", "", "bilinear"},
      {32, Resampling::bilinear_int8, "rotate_int8_032.png", " --int8",
       "signed bilinear (pixels - 128), 128 where uncovered"},
      {32, Resampling::nearest_int8, "rotate_nn_032.png", " --nearest",
       "signed nearest neighbour, 0 where uncovered"},
      {96, Resampling::nearest_int8, "rotate_nn_096.png", " --nearest", "signed nearest neighbour"},
  };
  Section section{"Rotation (angles in 1/256 turns, clockwise)", {}};
  for (const Case &c : cases) {
    Rotated rotated = rotate(source, c.angle, c.resampling);
    const std::string caption =
        "angle " + std::to_string(c.angle) + ", " + rotation_caption(rotated, c.kind);
    section.entries.push_back({c.file, std::move(rotated.canvas), caption,
                               "kelimg rotate source.png " + std::string(c.file) + " --angle " +
                                   std::to_string(c.angle) + c.option});
  }
  return section;
}

Section figures() {
  struct Case {
    const char *file, *caption;
    int32_t width, height;
    std::vector<Figure> figures;
  };
  std::vector<Case> cases = {
      {"lines.png",
       "lines, one crossing the left and right edges",
       64,
       64,
       {line(2, 61, 61, 2, 255), line(2, 61, 61, 30, 200), line(2, 61, 30, 2, 200),
        line(2, 61, 61, 61, 140), line(2, 61, 2, 2, 140), line(-20, 20, 80, 40, 255)}},
      {"triangles.png",
       "triangle outlines, one crossing the bottom edge",
       64,
       64,
       {triangle(32, 2, 61, 56, 2, 56, 255), triangle(32, 16, 48, 48, 16, 48, 200),
        triangle(32, 30, 38, 42, 26, 42, 140), triangle(50, 50, 70, 80, 40, 90, 255)}},
      {"rectangles.png",
       "rectangle outlines from 1 x 1 up, one crossing the corner",
       64,
       64,
       {rectangle(1, 1, 62, 62, 255), rectangle(8, 8, 30, 20, 200), rectangle(12, 12, 1, 1, 255),
        rectangle(16, 12, 2, 2, 255), rectangle(20, 12, 3, 3, 255), rectangle(26, 12, 4, 4, 255),
        rectangle(44, 44, 40, 40, 140)}},
      {"circles.png",
       "circles of diameters 1 to 8, 30 and 60, one crossing the edge",
       64,
       64,
       {circle(3, 3, 1, 255), circle(8, 3, 2, 255), circle(14, 4, 3, 255), circle(21, 4, 4, 255),
        circle(29, 5, 5, 255), circle(38, 5, 6, 255), circle(48, 6, 7, 255), circle(58, 6, 8, 255),
        circle(31, 37, 30, 200), circle(31, 33, 60, 140), circle(62, 62, 20, 255)}},
      {"numbers.png",
       "numbers on boxes of the complement colour, leading zeros, a minus sign",
       64,
       64,
       {number(2026, 2, 3, 255), number(7, 2, 16, 0, 3), number(-42, 2, 29, 200),
        number(123456789, 2, 42, 140), number(0, 40, 55, 255)}},
  };
  cases.push_back(
      {"figures.png",
       "every figure together",
       96,
       64,
       {rectangle(1, 1, 94, 62, 140), line(4, 58, 40, 6, 255), triangle(48, 6, 70, 40, 30, 40, 200),
        circle(74, 22, 25, 255), number(-2026, 40, 48, 255)}});
  Section section{"Figures (kelimg draw)", {}};
  for (Case &c : cases) {
    section.entries.push_back({c.file, canvas_with(c.width, c.height, 32, c.figures), c.caption,
                               draw_command(c.file, c.width, c.height, 32, c.figures)});
  }
  return section;
}

std::string html_page(const std::vector<Section> &sections) {
  std::string html =
      "<!DOCTYPE html>\n<html lang=\"en\">\n<head>\n<meta charset=\"utf-8\">\n"
      "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\">\n"
      "<title>kelimg gallery</title>\n<style>\n"
      "body { font-family: sans-serif; margin: 1.5em; background: #f4f4f4; }\n"
      ".sheet { display: flex; flex-wrap: wrap; gap: 1em; }\n"
      // Each card is as wide as its picture (set on the card) but never wider than the page; a
      // picture on a narrower card shrinks with it, keeping its shape.
      "figure { margin: 0; padding: 0.6em; background: #fff; box-sizing: content-box;\n"
      "  min-width: min(12em, 100% - 1.2em); max-width: calc(100% - 1.2em); }\n"
      "img { image-rendering: pixelated; display: block; max-width: 100%; height: auto; }\n"
      "figcaption { font-size: 0.85em; margin-top: 0.4em; }\n"
      "code { font-size: 0.85em; color: #444; word-break: break-all; }\n"
      "</style>\n</head>\n<body>\n<h1>kelimg gallery</h1>\n"
      "<p>Every picture was made by <code>kelimg demo</code> with the kel_images routines; the "
      "command under each one makes it again from the pictures in this directory. Pictures are "
      "shown at twice their size where the window has room.</p>\n";
  for (const Section &section : sections) {
    html += "<h2>" + section.title + "</h2>\n<div class=\"sheet\">\n";
    for (const Entry &entry : section.entries) {
      html += "<figure style=\"width: " + std::to_string(2 * entry.picture.width) +
              "px\"><img src=\"" + entry.name + "\" width=\"" +
              std::to_string(2 * entry.picture.width) + "\" height=\"" +
              std::to_string(2 * entry.picture.height) + "\" alt=\"" + entry.name +
              "\">\n<figcaption><b>" + entry.name + "</b>: " + entry.caption + "<br><code>" +
              entry.command + "</code></figcaption></figure>\n";
    }
    html += "</div>\n";
  }
  return html + "</body>\n</html>\n";
}

}  // namespace

Picture demo_picture() {
  std::vector<Figure> figures;
  // A left-to-right gradient from 40 to 190, one column line at a time.
  for (int32_t x = 0; x < kWidth; ++x) {
    figures.push_back(
        line(x, 0, x, kHeight - 1, static_cast<uint8_t>(40 + x * 150 / (kWidth - 1))));
  }
  // A target of rings, dark outside and white inside.
  for (int32_t diameter = 55; diameter >= 3; diameter -= 4) {
    figures.push_back(circle(38, 52, diameter, static_cast<uint8_t>(255 - 3 * diameter)));
  }
  for (int32_t step = 0; step < 4; ++step) {
    figures.push_back(triangle(112, 8 + 4 * step, 150 - 3 * step, 64 - 2 * step, 74 + 3 * step,
                               64 - 2 * step, static_cast<uint8_t>(250 - 50 * step)));
  }
  for (int32_t y = 70; y <= 110; y += 8) figures.push_back(line(80, 114, 156, y, 250));
  figures.push_back(rectangle(0, 0, kWidth, kHeight, 250));
  figures.push_back(number(2026, 8, 100, 250));
  figures.push_back(number(-42, 44, 100, 20));
  return canvas_with(kWidth, kHeight, 128, figures);
}

int write_demo(const std::string &directory) {
  std::error_code error;
  std::filesystem::create_directories(directory, error);
  if (error) throw InputError("cannot create '" + directory + "': " + error.message());

  const Picture source = demo_picture();
  const Statistics stats = statistics(source);
  const Picture broken = damaged(source);
  const Picture overlay = sticker();

  std::vector<Section> sections;
  sections.push_back(
      {"Test picture and statistics",
       {{"source.png", source, "the built-in test picture, drawn with the library",
         "kelimg demo DIR"},
        {"stats.png", plot_histogram(stats),
         "histogram; dashed: mean " + std::to_string(stats.mean) + "; bracket: mean &plusmn; " +
             "standard deviation " + std::to_string(stats.std_dev) + " (variance " +
             std::to_string(stats.variance) + ")",
         "kelimg stats source.png --plot stats.png"}}});
  sections.push_back(rotations(source));
  sections.push_back({"Brightness",
                      {{"brighten_50.png", brighten(source, 50), "half way to white",
                        "kelimg brighten source.png brighten_50.png --percent 50"},
                       {"darken_50.png", darken(source, 50), "half way to black",
                        "kelimg darken source.png darken_50.png --percent 50"}}});
  sections.push_back(
      {"Mask and fill",
       {{"damaged.png", broken, "the test picture with holes of value 0", "kelimg demo DIR"},
        {"mask.png", mask(broken, 0, true), "black where the picture holds the key 0",
         "kelimg mask damaged.png mask.png --key 0"},
        {"fill.png", fill(broken, mask(broken, 0, false)),
         "the holes filled from the values around them",
         "kelimg fill damaged.png fill.png --key 0"}}});
  sections.push_back(
      {"Paste and blend",
       {{"sticker.png", overlay, "the overlay; its 0 is the transparent key", "kelimg demo DIR"},
        {"paste.png", compose(source, overlay, 100, 60, 0, Compose::paste),
         "pasted at (100, 60), 0 transparent",
         "kelimg paste source.png sticker.png paste.png --x 100 --y 60 --key 0"},
        {"blend.png", compose(source, overlay, 100, 60, 0, Compose::blend),
         "blended (the mean of both) at (100, 60), 0 transparent",
         "kelimg blend source.png sticker.png blend.png --x 100 --y 60 --key 0"},
        {"paste_clipped.png", compose(source, overlay, -20, -12, 256, Compose::paste),
         "pasted at (-20, -12) without a key: clipped at the corner",
         "kelimg paste source.png sticker.png paste_clipped.png --x -20 --y -12"}}});
  sections.push_back(figures());

  int pictures = 0;
  for (const Section &section : sections) {
    for (const Entry &entry : section.entries) {
      save_picture((std::filesystem::path(directory) / entry.name).string(), entry.picture);
      ++pictures;
    }
  }
  save_text((std::filesystem::path(directory) / "index.html").string(), html_page(sections));
  return pictures;
}

}  // namespace kelimg
