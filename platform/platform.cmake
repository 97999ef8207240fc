# What differs between an Android device and a Linux host. On both, the log is liblog's.
find_path(QV_LIBLOG_INCLUDE_DIR android/log.h PATH_SUFFIXES android)
find_library(QV_LIBLOG_LIBRARY log PATH_SUFFIXES android ${CMAKE_LIBRARY_ARCHITECTURE}/android)
if(NOT QV_LIBLOG_INCLUDE_DIR OR NOT QV_LIBLOG_LIBRARY)
  message(FATAL_ERROR "liblog is missing; on Debian, install android-liblog-dev")
endif()
mark_as_advanced(QV_LIBLOG_INCLUDE_DIR QV_LIBLOG_LIBRARY)

add_library(qvtester_platform INTERFACE)
target_include_directories(qvtester_platform SYSTEM INTERFACE "${QV_LIBLOG_INCLUDE_DIR}")
target_link_libraries(qvtester_platform INTERFACE "${QV_LIBLOG_LIBRARY}")

if(ANDROID)
  set(QV_PLATFORM_SOURCES platform/files.cpp platform/log.cpp platform/android.cpp)
else()
  set(QV_PLATFORM_SOURCES platform/files.cpp platform/log.cpp platform/host.cpp platform/host_jpeg.cpp)
  find_package(PkgConfig REQUIRED)
  pkg_check_modules(turbojpeg REQUIRED IMPORTED_TARGET GLOBAL libturbojpeg)
  target_link_libraries(qvtester_platform INTERFACE PkgConfig::turbojpeg)
endif()

# Debian keeps liblog outside the loader's path.
if(NOT ANDROID)
  get_filename_component(QV_PLATFORM_RPATH "${QV_LIBLOG_LIBRARY}" DIRECTORY)
endif()
