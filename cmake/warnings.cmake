add_compile_options(
  -Wall -Wextra -Wshadow -Wformat=2 -Wswitch-enum -Wmissing-declarations -Wpointer-arith -Wcast-align -Wcast-qual
  -Wundef -Wvla -Wnull-dereference -Wold-style-cast -Wunused -Wdouble-promotion
  -Woverloaded-virtual)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  add_compile_options(-Wduplicated-cond -Wduplicated-branches -Wlogical-op -Wno-format-truncation)
endif()
if(VX_WERROR)
  add_compile_options(-Werror)
endif()
