# SPDX-License-Identifier: Apache-2.0
# Manual pages and completions, made from docs/ and from the programs' tables of options (tools/manual). What they need
# isn't everywhere; then they are left out.
find_package(Python3 COMPONENTS Interpreter)
find_program(TARN_SCDOC scdoc)
set(TARN_ZSH_DIR "share/zsh/site-functions" CACHE STRING "Where completions of zsh are installed, below the prefix")
if(NOT Python3_FOUND)
  message(STATUS "Manual pages and completions: left out, they need Python 3")
  return()
endif()
set(makers "${PROJECT_SOURCE_DIR}/tools/manual/pages.py" "${PROJECT_SOURCE_DIR}/tools/manual/completions.py")
set(table "${PROJECT_SOURCE_DIR}/docs/manual/commands.json")
set(made "")

# tarn_completion(PROGRAM SHELL FOLDER FILE)
function(tarn_completion program shell folder file)
  set(output "${CMAKE_CURRENT_BINARY_DIR}/completions/${shell}/${file}")
  add_custom_command(OUTPUT "${output}" DEPENDS ${makers} "${table}" VERBATIM
    COMMAND "${CMAKE_COMMAND}" -E make_directory "${CMAKE_CURRENT_BINARY_DIR}/completions/${shell}"
    COMMAND "${Python3_EXECUTABLE}" -B "${PROJECT_SOURCE_DIR}/tools/manual/completions.py" ${shell} ${program}
      > "${output}")
  install(FILES "${output}" DESTINATION "${folder}" COMPONENT service)
  set(made ${made} "${output}" PARENT_SCOPE)
endfunction()
foreach(program IN ITEMS tarnreportingd tarnreportingctl tarnreporting-alsa tarnreporting-pipewire
    tarnreporting-export tarnreporting-collect tarnreporting-fleet)
  if(NOT TARGET ${program})
    continue()
  endif()
  tarn_completion(${program} bash share/bash-completion/completions ${program})
  tarn_completion(${program} zsh "${TARN_ZSH_DIR}" _${program})
  tarn_completion(${program} fish share/fish/vendor_completions.d ${program}.fish)
endforeach()

if(TARN_SCDOC)
  file(GLOB templates CONFIGURE_DEPENDS "${PROJECT_SOURCE_DIR}/docs/manual/*.md")
  file(GLOB documents CONFIGURE_DEPENDS "${PROJECT_SOURCE_DIR}/docs/*.md")
  foreach(template IN LISTS templates)
    get_filename_component(page "${template}" NAME)
    string(REGEX REPLACE "\\.md$" "" page "${page}")
    string(REGEX REPLACE ".*\\." "" section "${page}")
    # The page of a program that is left out.
    string(REGEX REPLACE "\\.[0-9]$" "" program "${page}")
    if(program MATCHES "^tarnreporting-(pipewire|export|collect|fleet)$" AND NOT TARGET ${program})
      continue()
    endif()
    set(output "${CMAKE_CURRENT_BINARY_DIR}/manual/${page}")
    add_custom_command(OUTPUT "${output}" DEPENDS ${makers} "${table}" "${template}" ${documents} VERBATIM
      COMMAND "${CMAKE_COMMAND}" -E make_directory "${CMAKE_CURRENT_BINARY_DIR}/manual"
      COMMAND "${Python3_EXECUTABLE}" -B "${PROJECT_SOURCE_DIR}/tools/manual/pages.py" scdoc "${template}"
        > "${output}.scd"
      COMMAND "${TARN_SCDOC}" < "${output}.scd" > "${output}")
    install(FILES "${output}" DESTINATION "${CMAKE_INSTALL_MANDIR}/man${section}" COMPONENT service)
    list(APPEND made "${output}")
  endforeach()
else()
  message(STATUS "Manual pages: left out, they need scdoc")
endif()
add_custom_target(tarn_manual ALL DEPENDS ${made})
add_dependencies(tarn_installed tarn_manual)
