#include "kel_outside.h"
