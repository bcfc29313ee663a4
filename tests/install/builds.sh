# How distributors build the library, other than by a preset. Sourced by check-install, never run.

# built NAME OPTION...: configures the sources into $work/NAME, without a warning of CMake's, builds
# the library and installs it into $work/NAME.image.
built() {
  local name=$1
  shift
  cmake -S . -B "$work/$name" -G Ninja -DSSOCLIENT_TOOLS=OFF -Werror=dev "$@" >"$work/$name.log" 2>&1 ||
    { tail -n 20 "$work/$name.log" && return 1; }
  ! grep -A9 'CMake Warning\|CMake Deprecation' "$work/$name.log" &&
    cmake --build "$work/$name" -j "$jobs" &&
    cmake --install "$work/$name" --prefix "$work/$name.image"
}
text_size() { size "$1" | awk 'NR == 2 {print $1}'; }
pc_of() { find "$work/$1.image" -name pkgconfig; }

# --- optimisation and warnings
small_text() {
  local size
  size=$(text_size "$work/os/sso/libssoclient.so") && echo "text: $size bytes" && [ "$size" -le 73728 ]
}
no_other_level() {
  cmake -S . -B "$work/os" -DCMAKE_EXPORT_COMPILE_COMMANDS=ON >/dev/null &&
    grep -q -- ' -Os ' "$work/os/compile_commands.json" &&
    ! grep -oE -- ' -O([0-3]|fast|g) ' "$work/os/compile_commands.json"
}
pedantic="-Wall -Wextra -Wpedantic -Wformat=2 -Wshadow -Wconversion -Werror"
check "a distribution's -Os and -Wpedantic, build type Release" built os -DCMAKE_BUILD_TYPE=Release \
  -DCMAKE_C_FLAGS="-Os $pedantic" -DCMAKE_CXX_FLAGS="-Os $pedantic"
check "-Os is the only level" no_other_level
check "with -Os its text is at most 72 KB" small_text
check "clang -Wpedantic" built clang -DCMAKE_C_COMPILER=clang -DCMAKE_CXX_COMPILER=clang++ \
  -DCMAKE_C_FLAGS="$pedantic" -DCMAKE_CXX_FLAGS="$pedantic"
check "the default build type is the smallest" grep -q '^CMAKE_BUILD_TYPE:STRING=MinSizeRel$' \
  "$work/clang/CMakeCache.txt"

# --- components
runtime_alone() {
  cmake --install "$work/os" --prefix "$work/image" --component runtime >/dev/null &&
    diff <(find "$work/image" ! -type d -printf '%f\n' | sort) \
      <(printf '%s\n' libssoclient.so.1 "libssoclient.so.$(pkg-config --modversion ssoclient)")
}
check "the component runtime is the library alone" runtime_alone

# --- without pkg-config
without_pkg_config=-DPKG_CONFIG_EXECUTABLE=/nonexistent
check "it builds without pkg-config" built plain $without_pkg_config
package_without() {
  cmake -S "$work" -B "$work/plain-program" -DCMAKE_PREFIX_PATH="$work/plain.image" $without_pkg_config &&
    cmake --build "$work/plain-program" && "$work/plain-program/program"
}
check "a program by find_package(ssoclient) without pkg-config" package_without
finds_openssl() {
  grep -r 'find_dependency(OpenSSL' "$work/plain.image" && grep -rl 'OpenSSL::Crypto' "$work/plain.image" &&
    ldd "$work/plain-program/program" | grep libcrypto
}
check "the package finds OpenSSL" finds_openssl
tests_without_winbind() {
  cmake -S . -B "$work/tests" -G Ninja -DBUILD_TESTING=ON $without_pkg_config 2>&1 | tee "$work/log" | tail -n 20
  grep -q "libwbclient's headers are missing" "$work/log" && [ -e "$work/tests/build.ninja" ]
}
check "BUILD_TESTING=ON without libwbclient's headers leaves one test out" tests_without_winbind

# --- static
static_program() { # NAME
  g++ -std=c++17 $strict "$work/program.cpp" -o "$work/static" \
    $(PKG_CONFIG_PATH=$(pc_of "$1") pkg-config --static --cflags --libs ssoclient) && "$work/static" &&
    cmake -S "$work" -B "$work/$1-program" -DCMAKE_PREFIX_PATH="$work/$1.image" >/dev/null &&
    cmake --build "$work/$1-program" && "$work/$1-program/program" &&
    ! readelf -d "$work/static" "$work/$1-program/program" | grep 'NEEDED.*libssoclient'
}
check "BUILD_SHARED_LIBS=OFF makes a static library" built late -DBUILD_SHARED_LIBS=OFF
check "programs link it, by pkg-config and by CMake package" static_program late
check "and with libcurl linked" built linked -DBUILD_SHARED_LIBS=OFF -DSSOCLIENT_LATE_CURL=OFF
check "programs link that too" static_program linked

# --- in a larger project
mkdir "$work/larger"
cat >"$work/larger/CMakeLists.txt" <<END
cmake_minimum_required(VERSION 3.18)
project(larger LANGUAGES C CXX)
enable_testing()
add_subdirectory($root ssoclient)
if(DEFINED CACHE{BUILD_TESTING} AND NOT ASKED)
  message(FATAL_ERROR "BUILD_TESTING leaks out")
endif()
add_executable(program $work/program.cpp)
target_link_libraries(program ssoclient::ssoclient)
END
larger() {
  cmake -S "$work/larger" -B "$work/larger/out" >/dev/null && rm -r "$work/larger/out" &&
    cmake -S "$work/larger" -B "$work/larger/out" -DASKED=ON -DBUILD_TESTING=ON &&
    cmake --build "$work/larger/out" -j "$jobs" && "$work/larger/out/program" &&
    (cd "$work/larger/out" && ctest -N | grep 'Total Tests: 0') &&
    cmake --install "$work/larger/out" --prefix "$work/larger/image" && [ ! -e "$work/larger/image" ]
}
check "a larger project gets neither its tests nor its installation" larger

# --- a device's own platform library
device_platform() {
  cmake -S . -B "$work/$1" -G Ninja -DSSOCLIENT_TOOLS=OFF \
    -DSSOCLIENT_PLATFORM_LIBRARY="$work/lib$1.so" >/dev/null &&
    cmake --build "$work/$1" -j "$jobs" --target ssoclient
}
reference="platform/encoding.c platform/passthrough.c"
gcc -shared -fPIC -I. $reference -o "$work/libwhole.so"
gcc -shared -fPIC -I. -DQOVACGIURLEncode=SomethingElse $reference -o "$work/liblacking.so"
check "it links with a device's own platform library" device_platform whole
links_device() { readelf -d "$work"/whole/sso/libssoclient.so | grep -q 'NEEDED.*whole.so'; }
check "and then needs that library" links_device
lacking_fails() { ! device_platform lacking >"$work/log" 2>&1 && grep -q "undefined.*QOVACGIURLEncode" "$work/log"; }
check "a platform function that is missing is a link-time error" lacking_fails
relative_library() {
  (cd "$work" && cmake -S "$root" -B relative -G Ninja -DSSOCLIENT_TOOLS=OFF \
    -DSSOCLIENT_PLATFORM_LIBRARY=libwhole.so) >/dev/null && cmake --build "$work/relative" -j "$jobs"
}
check "and by a relative path" relative_library
