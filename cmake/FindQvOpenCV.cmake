# The OpenCV modules that qvtester uses, as targets QvOpenCV::<module>, from the components asked for.
# OpenCV's own package file is Debian's libopencv-dev, which brings every module there is; the modules' own -dev packages
# bring headers and libraries only, so these are looked for by name.
find_path(QvOpenCV_INCLUDE_DIR opencv2/core.hpp PATH_SUFFIXES opencv4)
set(_required QvOpenCV_INCLUDE_DIR)
foreach(_module IN LISTS QvOpenCV_FIND_COMPONENTS)
  find_library(QvOpenCV_${_module}_LIBRARY opencv_${_module})
  mark_as_advanced(QvOpenCV_${_module}_LIBRARY)
  list(APPEND _required QvOpenCV_${_module}_LIBRARY)
endforeach()
mark_as_advanced(QvOpenCV_INCLUDE_DIR)

include(FindPackageHandleStandardArgs)
find_package_handle_standard_args(QvOpenCV REQUIRED_VARS ${_required})

if(QvOpenCV_FOUND)
  foreach(_module IN LISTS QvOpenCV_FIND_COMPONENTS)
    if(NOT TARGET QvOpenCV::${_module})
      add_library(QvOpenCV::${_module} UNKNOWN IMPORTED)
      set_target_properties(QvOpenCV::${_module} PROPERTIES
        IMPORTED_LOCATION "${QvOpenCV_${_module}_LIBRARY}"
        INTERFACE_INCLUDE_DIRECTORIES "${QvOpenCV_INCLUDE_DIR}")
    endif()
  endforeach()
endif()
