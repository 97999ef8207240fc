# One static library of the desk or of the tests, on top of the targets that it depends on, whose include paths and link
# requirements come with them.
#   qv_library(NAME name SOURCES files... DEPENDS targets...)
# A source may be a pattern, so that a new file needs no line here.
function(qv_library)
  cmake_parse_arguments(PARSE_ARGV 0 QV "" "NAME" "SOURCES;DEPENDS")
  qv_expand(QV_SOURCES)
  add_library(${QV_NAME} STATIC ${QV_SOURCES})
  target_include_directories(${QV_NAME} PUBLIC "${PROJECT_SOURCE_DIR}")
  target_link_libraries(${QV_NAME} PUBLIC ${QV_DEPENDS})
endfunction()

# A program, in the same words.
function(qv_program)
  cmake_parse_arguments(PARSE_ARGV 0 QV "" "NAME" "SOURCES;DEPENDS")
  qv_expand(QV_SOURCES)
  add_executable(${QV_NAME} ${QV_SOURCES})
  target_include_directories(${QV_NAME} PRIVATE "${PROJECT_SOURCE_DIR}")
  target_link_libraries(${QV_NAME} PRIVATE ${QV_DEPENDS} $<TARGET_NAME_IF_EXISTS:qv_sanitizer_defaults>)
endfunction()

# Replaces the patterns in a list of sources by the files that match; other names stay, so that a missing file is told.
macro(qv_expand list)
  set(_expanded "")
  foreach(_source IN LISTS ${list})
    if(_source MATCHES "[*]")
      file(GLOB _matching CONFIGURE_DEPENDS "${_source}")
      list(APPEND _expanded ${_matching})
    else()
      list(APPEND _expanded "${_source}")
    endif()
  endforeach()
  set(${list} ${_expanded})
endmacro()
