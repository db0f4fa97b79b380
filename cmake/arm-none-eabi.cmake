# Cross-compiles the library for a Cortex-M with Debian's arm-none-eabi toolchain: a Cortex-M4
# unless a toolchain file for another core sets KEL_ARM_CPU_FLAGS and includes this one. Only the
# libraries are built: there is no C library runtime to link a program against here.
set(CMAKE_SYSTEM_NAME Generic)
set(CMAKE_SYSTEM_PROCESSOR arm)
set(CMAKE_C_COMPILER arm-none-eabi-gcc)
set(CMAKE_CXX_COMPILER arm-none-eabi-g++)
set(CMAKE_TRY_COMPILE_TARGET_TYPE STATIC_LIBRARY)
if(NOT KEL_ARM_CPU_FLAGS)
  set(KEL_ARM_CPU_FLAGS "-mcpu=cortex-m4 -mthumb")
endif()
set(CMAKE_C_FLAGS_INIT "${KEL_ARM_CPU_FLAGS}")
set(CMAKE_CXX_FLAGS_INIT "${KEL_ARM_CPU_FLAGS} -fno-exceptions -fno-rtti")
# Built for size, two of GCC's heuristics are off where they made the code larger for the same
# instruction counts (the README's size section has the figures): summarising what calls modify,
# everywhere, and inlining small functions, in the core library alone (KEL_CORE_SIZE_FLAGS, which
# CMakeLists.txt adds to it); in our outside functions that inlining saves room.
set(KEL_ARM_SIZE_FLAGS "-Os -fno-ipa-modref")
set(KEL_CORE_SIZE_FLAGS -fno-inline-small-functions)
set(CMAKE_C_FLAGS_MINSIZEREL_INIT "${KEL_ARM_SIZE_FLAGS}")
set(CMAKE_CXX_FLAGS_MINSIZEREL_INIT "${KEL_ARM_SIZE_FLAGS}")
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
