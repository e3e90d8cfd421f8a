# quillet_library(name [DEPS name...])
#
# The static library quillet_<name> of all .cc files of core/<name>.
function(quillet_library name)
  cmake_parse_arguments(ARG "" "" "DEPS" ${ARGN})
  file(GLOB sources CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/core/${name}/*.cc)
  add_library(quillet_${name} STATIC ${sources})
  quillet_compile_options(quillet_${name})
  target_include_directories(quillet_${name} PUBLIC ${PROJECT_SOURCE_DIR}/core)
  foreach(dep IN LISTS ARG_DEPS)
    target_link_libraries(quillet_${name} PUBLIC quillet_${dep})
  endforeach()
endfunction()

# Warnings are errors unless a package is built, and the sanitizers of the preset apply to everything.
#
# With CMAKE_UNITY_BUILD files are compiled together, which takes half the time of a build from nothing: names in
# anonymous namespaces are therefore unique within a folder.
function(quillet_compile_options target)
  target_compile_options(${target} PRIVATE -Wall -Wextra -Wshadow)
  if(QUILLET_WARNINGS_AS_ERRORS)
    target_compile_options(${target} PRIVATE -Werror)
  endif()
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
    # g++ 12 sees overlapping copies inside std::string where there are none.
    target_compile_options(${target} PRIVATE -Wno-restrict)
  endif()
  quillet_sanitize(${target})
endfunction()

function(quillet_sanitize target)
  if(QUILLET_SANITIZE)
    target_compile_options(${target} PRIVATE -fsanitize=${QUILLET_SANITIZE} -fno-omit-frame-pointer -fno-sanitize-recover=all)
    target_link_options(${target} PRIVATE -fsanitize=${QUILLET_SANITIZE})
  endif()
endfunction()
