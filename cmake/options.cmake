# wzor_options: how every target of ours is compiled and linked, for the library and its users alike.
add_library(wzor_options INTERFACE)

target_compile_features(wzor_options INTERFACE cxx_std_20)
target_compile_options(wzor_options INTERFACE -fstack-protector-strong -fstack-clash-protection)

# 64-bit offsets, inode numbers and times in system calls, on 32-bit builds as well.
target_compile_definitions(wzor_options INTERFACE _FILE_OFFSET_BITS=64 _TIME_BITS=64)

# The C++ library checks indices and iterators where that costs next to nothing.
target_compile_definitions(wzor_options INTERFACE _GLIBCXX_ASSERTIONS)

target_link_options(wzor_options INTERFACE
                    -Wl,-z,relro,-z,now,-z,noexecstack,-z,separate-code,-z,text)

# wzor_warnings: linked privately, so that a user of the library chooses its own warnings. They are
# errors only where a preset sets CMAKE_COMPILE_WARNING_AS_ERROR: never for a release build, whose
# compiler may be newer than any that was tried.
add_library(wzor_warnings INTERFACE)
target_compile_options(wzor_warnings INTERFACE -Wall -Wextra -Wpedantic -Wconversion -Wshadow)

if(WZOR_SANITIZE)
  set(sanitizers -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer)
  target_compile_options(wzor_options INTERFACE ${sanitizers})
  target_link_options(wzor_options INTERFACE ${sanitizers})
elseif(CMAKE_BUILD_TYPE STREQUAL "Release")
  include(cmake/shipping.cmake)
endif()

if(WZOR_FUZZ) # coverage for libFuzzer; its main() only goes into the fuzz targets
  target_compile_options(wzor_options INTERFACE -fsanitize=fuzzer-no-link)
  target_link_options(wzor_options INTERFACE -fsanitize=fuzzer-no-link)
endif()

if(WZOR_COVERAGE)
  target_compile_options(wzor_options INTERFACE --coverage)
  target_link_options(wzor_options INTERFACE --coverage)
endif()
