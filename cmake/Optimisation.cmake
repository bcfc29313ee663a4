# How much the compiler optimises, where this is the whole project.

# A level in CMAKE_CXX_FLAGS or CXXFLAGS, a distribution's -Os for example, is the one that counts.
# CMake would put the build type's level behind it.
foreach(language C CXX)
  if(CMAKE_${language}_FLAGS MATCHES "(^| )-O")
    foreach(type RELEASE RELWITHDEBINFO MINSIZEREL)
      string(REGEX REPLACE "(^| )-O[^ ]*" "" CMAKE_${language}_FLAGS_${type}
             "${CMAKE_${language}_FLAGS_${type}}")
    endforeach()
  endif()
endforeach()

# Without a level and a build type: the smallest. A login takes 0.3 % more instructions than with -O2.
get_property(multi_config GLOBAL PROPERTY GENERATOR_IS_MULTI_CONFIG)
if(NOT CMAKE_BUILD_TYPE AND NOT multi_config AND NOT CMAKE_CXX_FLAGS MATCHES "(^| )-O")
  set(CMAKE_BUILD_TYPE MinSizeRel CACHE STRING "Debug, Release, RelWithDebInfo or MinSizeRel" FORCE)
endif()
