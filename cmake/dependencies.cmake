# Locates the platform libraries the service links against on a Linux host.
# Debian ships the AOSP libraries (Android 10) under /usr/lib/<multiarch>/android
# without pkg-config files, so they are found by path and given a run path.
find_package(PkgConfig REQUIRED)
pkg_check_modules(LIBNL REQUIRED IMPORTED_TARGET libnl-3.0 libnl-genl-3.0)
# The host service manager reads the VINTF fragment with the XML library the
# platform's own manifest reader uses.
pkg_check_modules(TINYXML2 REQUIRED IMPORTED_TARGET tinyxml2)

set(DALIX_ANDROID_LIBDIRS /usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/android /usr/lib/android)
find_path(ANDROID_PLATFORM_INCLUDE_DIR utils/Looper.h PATHS /usr/include/android REQUIRED)
foreach(lib utils base log)
  string(TOUPPER ${lib} upper)
  find_library(ANDROID_LIB${upper} NAMES ${lib} PATHS ${DALIX_ANDROID_LIBDIRS} NO_DEFAULT_PATH
               REQUIRED)
endforeach()
get_filename_component(DALIX_ANDROID_RPATH ${ANDROID_LIBUTILS} DIRECTORY)

add_library(android_platform INTERFACE)
target_include_directories(android_platform SYSTEM INTERFACE ${ANDROID_PLATFORM_INCLUDE_DIR})
target_link_libraries(android_platform INTERFACE ${ANDROID_LIBUTILS} ${ANDROID_LIBBASE}
                                                 ${ANDROID_LIBLOG})
target_link_options(android_platform INTERFACE "LINKER:-rpath,${DALIX_ANDROID_RPATH}")
add_library(dalix::android_platform ALIAS android_platform)

find_package(GTest REQUIRED)
find_package(Threads REQUIRED)
if(DALIX_BUILD_BENCHMARKS)
  find_package(benchmark REQUIRED)
endif()
