#include "kel_images.h"
