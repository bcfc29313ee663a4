# Finds jsoncpp, without pkg-config too, as the target JsonCpp::JsonCpp. Installed with the library's
# CMake package, because the public headers need it.
find_package(PkgConfig QUIET)
if(PkgConfig_FOUND)
  pkg_check_modules(PC_JSONCPP QUIET jsoncpp)
endif()
find_path(JsonCpp_INCLUDE_DIR json/value.h HINTS ${PC_JSONCPP_INCLUDE_DIRS} PATH_SUFFIXES jsoncpp)
find_library(JsonCpp_LIBRARY jsoncpp HINTS ${PC_JSONCPP_LIBRARY_DIRS})
mark_as_advanced(JsonCpp_INCLUDE_DIR JsonCpp_LIBRARY)

include(FindPackageHandleStandardArgs)
find_package_handle_standard_args(JsonCpp REQUIRED_VARS JsonCpp_LIBRARY JsonCpp_INCLUDE_DIR)
if(JsonCpp_FOUND AND NOT TARGET JsonCpp::JsonCpp)
  add_library(JsonCpp::JsonCpp UNKNOWN IMPORTED)
  set_target_properties(JsonCpp::JsonCpp PROPERTIES
    IMPORTED_LOCATION "${JsonCpp_LIBRARY}" INTERFACE_INCLUDE_DIRECTORIES "${JsonCpp_INCLUDE_DIR}")
endif()
