# As mingw-x86_64.cmake, with the POSIX thread model (std::thread, std::mutex),
# which Google Benchmark needs; the add-in itself is built with the Win32 one.
include(${CMAKE_CURRENT_LIST_DIR}/mingw-x86_64.cmake)
set(CMAKE_C_COMPILER ${KPX_MINGW_PREFIX}-gcc-posix)
set(CMAKE_CXX_COMPILER ${KPX_MINGW_PREFIX}-g++-posix)
