add_compile_options(
  -Wall -Wextra -Wshadow -Wformat=2 -Wswitch-enum -Wmissing-declarations -Wpointer-arith -Wcast-align -Wcast-qual
  -Wundef -Wvla -Wnull-dereference -Wold-style-cast -Wunused -Wdouble-promotion
  -Woverloaded-virtual)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  add_compile_options(-Wduplicated-cond -Wduplicated-branches -Wlogical-op -Wno-format-truncation)
endif()
# Where a number may not change its type in silence: what runs on the handset, stand-ins included.
set(VX_CONVERSION_WARNINGS -Wconversion -Wsign-conversion)
if(VX_WERROR)
  add_compile_options(-Werror)
endif()
