# What ships: the Release builds. Their wzorinst carries zlib, libdeflate, libstdc++ and libgcc,
# keeps its debug symbols in a file of its own, and has the same bytes wherever the tree is built.
set(WZOR_SHIPPING ON)

# The build stamp holds the release's version and date; the project's version is its first three
# numbers. All that ships with a time has this one.
file(STRINGS src/install/standalone/build_stamp.cpp stamp REGEX "zorBuildStamp =")
string(REGEX MATCH "\"(..)/(..)/(..)zor_([0-9.]+)\\.[0-9]+\"" stamp "${stamp}")
if(NOT CMAKE_MATCH_4 STREQUAL PROJECT_VERSION)
  message(FATAL_ERROR "The build stamp is not one of version ${PROJECT_VERSION}: ${stamp}")
endif()
execute_process(
  COMMAND date --utc --date=20${CMAKE_MATCH_1}-${CMAKE_MATCH_2}-${CMAKE_MATCH_3} +%s
  OUTPUT_VARIABLE WZOR_RELEASE_TIME OUTPUT_STRIP_TRAILING_WHITESPACE COMMAND_ERROR_IS_FATAL ANY)

target_compile_definitions(wzor_options INTERFACE _FORTIFY_SOURCE=3)

# The debug symbols name this directory instead of the path of the source tree.
set(source_name /usr/src/wzorinst-${PROJECT_VERSION})
add_compile_options(-g)
target_compile_options(
  wzor_options INTERFACE -ffile-prefix-map=${CMAKE_SOURCE_DIR}=${source_name}
                         -ffile-prefix-map=${CMAKE_BINARY_DIR}=${source_name}/build)

# Several sources of a target are compiled as one, which takes less than half the time: the headers
# are read once for all of them. The other builds compile file by file.
set(CMAKE_UNITY_BUILD ON CACHE BOOL "Compile several sources at a time")
set(CMAKE_UNITY_BUILD_BATCH_SIZE 12)

# Archives without times and owners.
set(CMAKE_CXX_ARCHIVE_CREATE "<CMAKE_AR> qcD <TARGET> <LINK_FLAGS> <OBJECTS>")
set(CMAKE_CXX_ARCHIVE_FINISH "<CMAKE_RANLIB> -D <TARGET>")

# wzor_shipping: for programs that bring their own C++ runtime. What nothing uses is left out, and
# with it what would need a newer C library.
add_library(wzor_shipping INTERFACE)
target_sources(wzor_shipping INTERFACE ${CMAKE_SOURCE_DIR}/src/install/standalone/unwind_tables.cpp)
target_link_options(wzor_shipping INTERFACE -static-libstdc++ -static-libgcc -Wl,--gc-sections)

# Moves the symbols of the program `target` to a ".debug" file next to it, which it names.
function(split_debug_symbols target)
  set(program $<TARGET_FILE:${target}>)
  add_custom_command(
    TARGET ${target}
    POST_BUILD
    COMMAND ${CMAKE_OBJCOPY} --only-keep-debug ${program} ${program}.debug
    COMMAND ${CMAKE_OBJCOPY} --strip-all --remove-section=.comment
            --add-gnu-debuglink=${program}.debug ${program}
    BYPRODUCTS ${target}.debug
    VERBATIM)
endfunction()
