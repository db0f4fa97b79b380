# Cross-compiles the library for a Cortex-M55 with its vector extension (Helium, MVE) on: the
# hard-float ABI, since -mfloat-abi=soft switches MVE off.
set(KEL_ARM_CPU_FLAGS "-mcpu=cortex-m55 -mthumb -mfloat-abi=hard")
include(${CMAKE_CURRENT_LIST_DIR}/arm-none-eabi.cmake)
