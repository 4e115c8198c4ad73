# What the sanitizers and the coverage build add. Everything is built with them, libraries included.
if(VX_SANITIZE)
  add_compile_options(-fsanitize=${VX_SANITIZE} -fno-omit-frame-pointer -g)
  add_link_options(-fsanitize=${VX_SANITIZE})
  if(VX_SANITIZE MATCHES "undefined")
    add_compile_options(-fno-sanitize-recover=undefined)
  endif()
  # Sanitized code reports paths that -O2 can no longer follow.
  add_compile_options(-Wno-null-dereference)
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    add_compile_options(-Wno-maybe-uninitialized -Wno-stringop-overflow)
  endif()
endif()
if(VX_COVERAGE)
  # Not --coverage, which no later option takes back.
  add_compile_options(-fprofile-arcs -ftest-coverage -fprofile-update=atomic -g -O0)
  add_link_options(--coverage)
endif()

# What a program of an instrumented build has beside its own code: one that ends by _exit writes its counts first, and
# the thread sanitizer gets the help it needs.
function(vx_instrument_program target)
  if(VX_COVERAGE)
    target_sources(${target} PRIVATE ${CMAKE_SOURCE_DIR}/cmake/coverage-exit.cpp)
    target_link_options(${target} PRIVATE -Wl,--wrap=_exit)
  endif()
  if(VX_SANITIZE MATCHES "thread")
    target_sources(${target} PRIVATE ${CMAKE_SOURCE_DIR}/cmake/tsan-support.cpp)
    target_link_options(${target} PRIVATE -Wl,--wrap=read -Wl,--wrap=sigaction)
  endif()
endfunction()

# What stays as it is in an instrumented build: preloaded libraries, and programs that are run beside the service.
function(vx_never_instrument target)
  if(VX_SANITIZE)
    target_compile_options(${target} PRIVATE -fno-sanitize=all)
    target_link_options(${target} PRIVATE -fno-sanitize=all)
  endif()
  if(VX_COVERAGE)
    target_compile_options(${target} PRIVATE -fno-profile-arcs -fno-test-coverage)
  endif()
endfunction()
