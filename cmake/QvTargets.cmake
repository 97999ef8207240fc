# One static library of the desk or of the tests, on top of the targets that it depends on, whose include paths and link
# requirements come with them.
#   qv_library(NAME name SOURCES files... DEPENDS targets...)
function(qv_library)
  cmake_parse_arguments(PARSE_ARGV 0 QV "" "NAME" "SOURCES;DEPENDS")
  add_library(${QV_NAME} STATIC ${QV_SOURCES})
  target_include_directories(${QV_NAME} PUBLIC "${PROJECT_SOURCE_DIR}")
  target_link_libraries(${QV_NAME} PUBLIC ${QV_DEPENDS})
endfunction()

# A program, in the same words.
function(qv_program)
  cmake_parse_arguments(PARSE_ARGV 0 QV "" "NAME" "SOURCES;DEPENDS")
  add_executable(${QV_NAME} ${QV_SOURCES})
  target_include_directories(${QV_NAME} PRIVATE "${PROJECT_SOURCE_DIR}")
  target_link_libraries(${QV_NAME} PRIVATE ${QV_DEPENDS} $<TARGET_NAME_IF_EXISTS:qv_sanitizer_defaults>)
endfunction()
