// kelimg demo: a built-in test picture and a gallery of every routine applied to it.
#ifndef KELIMG_DEMO_H
#define KELIMG_DEMO_H

#include <string>

#include "picture.h"

namespace kelimg {

// Gradients, rings, triangles, lines and numbers, all drawn with the library. It holds no 0,
// which the damaged copy of the gallery uses to mark its holes.
Picture demo_picture();

// Writes one PNG per operation and an index.html contact sheet into directory, creating it.
// Returns the number of pictures written.
int write_demo(const std::string &directory);

}  // namespace kelimg

#endif  // KELIMG_DEMO_H
