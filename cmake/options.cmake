# wzor_options: what every target of ours is compiled and linked with.
add_library(wzor_options INTERFACE)

target_compile_features(wzor_options INTERFACE cxx_std_20)
target_compile_options(wzor_options INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wshadow -Werror -fstack-protector-strong)

# 64-bit offsets, inode numbers and times in system calls, on 32-bit builds as well.
target_compile_definitions(wzor_options INTERFACE _FILE_OFFSET_BITS=64 _TIME_BITS=64)

target_link_options(wzor_options INTERFACE -Wl,-z,relro,-z,now)

if(WZOR_SANITIZE)
  set(sanitizers -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer)
  target_compile_options(wzor_options INTERFACE ${sanitizers})
  target_link_options(wzor_options INTERFACE ${sanitizers})
else()
  target_compile_definitions(wzor_options INTERFACE $<$<CONFIG:Release>:_FORTIFY_SOURCE=2>)
endif()
