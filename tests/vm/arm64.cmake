# The cross compiler of Debian, with the libraries that tests/vm/fetch has unpacked.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(CMAKE_CXX_COMPILER aarch64-linux-gnu-g++)
set(debian ${CMAKE_CURRENT_LIST_DIR}/../../build/vm/arm64/debian)
set(ZLIB_LIBRARY ${debian}/usr/lib/aarch64-linux-gnu/libz.a)
set(ZLIB_INCLUDE_DIR ${debian}/usr/include)
