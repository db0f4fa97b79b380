# As s390x-linux-gnu.cmake, with clang: it builds Highway's four-lane portable target, which
# GCC 12.2 leaves for the one-lane one, so the vector code is checked in big-endian byte order too.
include(${CMAKE_CURRENT_LIST_DIR}/s390x-linux-gnu.cmake)
set(CMAKE_C_COMPILER clang)
set(CMAKE_C_COMPILER_TARGET s390x-linux-gnu)
set(CMAKE_CXX_COMPILER clang++)
set(CMAKE_CXX_COMPILER_TARGET s390x-linux-gnu)
