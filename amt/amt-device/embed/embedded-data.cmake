# Data files that the daemon carries as constant data: a source is made of each when the daemon is built.
find_program(VX_PYTHON NAMES python3 HINTS /usr/bin REQUIRED)

set(VX_EMBED_DIR ${CMAKE_CURRENT_LIST_DIR})

function(vx_embed target kind input)
  get_filename_component(name ${input} NAME_WE)
  set(output ${CMAKE_CURRENT_BINARY_DIR}/${name}-data.cpp)
  add_custom_command(
    OUTPUT ${output}
    COMMAND ${VX_PYTHON} ${VX_EMBED_DIR}/embed-data.py ${kind} ${input} ${output}
    DEPENDS ${VX_EMBED_DIR}/embed-data.py ${input}
    VERBATIM)
  target_sources(${target} PRIVATE ${output})
endfunction()

vx_embed(amt picture ${VX_EMBED_DIR}/handshake-picture.png)
vx_embed(amt script ${CMAKE_SOURCE_DIR}/scripts/wifi-radio-test.sh)
