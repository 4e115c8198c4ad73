# What the sanitizers and the coverage build add. Everything is built with them, libraries included.
if(VX_SANITIZE)
  add_compile_options(-fsanitize=${VX_SANITIZE} -fno-omit-frame-pointer -g)
  add_link_options(-fsanitize=${VX_SANITIZE})
  if(VX_SANITIZE MATCHES "undefined")
    add_compile_options(-fno-sanitize-recover=undefined)
  endif()
  # Sanitized code reports paths that -O2 can no longer follow.
  add_compile_options(-Wno-null-dereference -Wno-maybe-uninitialized -Wno-stringop-overflow)
endif()
if(VX_COVERAGE)
  add_compile_options(--coverage -fprofile-update=atomic -g -O0)
  add_link_options(--coverage)
endif()
