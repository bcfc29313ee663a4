#include "sso/internal/nonce.h"

#include <fcntl.h>
#include <sys/random.h>
#include <sys/types.h>
#include <unistd.h>

#include <algorithm>
#include <boost/random/mersenne_twister.hpp>
#include <boost/uuid/random_generator.hpp>
#include <boost/uuid/uuid_io.hpp>
#include <cerrno>
#include <chrono>

namespace QOVA {
namespace SSO {

namespace {

// Seeds a random engine from "/dev/urandom": its whole state in one read, where Boost's own
// seeding takes one read for each word.
struct RandomSeed {
  template <typename Word>
  void generate(Word* begin, Word* end) const {
    const size_t size = static_cast<size_t>(end - begin) * sizeof *begin;
    const int file = open("/dev/urandom", O_RDONLY | O_CLOEXEC);
    const ssize_t count = file < 0 ? -1 : read(file, begin, size);
    if (file >= 0) close(file);
    if (count == static_cast<ssize_t>(size)) return;

    // No such device in this root, or an interrupted read: ask the kernel itself. With neither,
    // the clock and the process are all there is.
    std::fill(begin, end, 0);
    begin[0] = static_cast<Word>(std::chrono::system_clock::now().time_since_epoch().count());
    begin[1] = static_cast<Word>(getpid());
    char* const bytes = reinterpret_cast<char*>(begin);
    for (size_t done = 0; done < size;) {
      const ssize_t more = getrandom(bytes + done, size - done, 0);
      if (more < 0 && errno == EINTR) continue;
      if (more <= 0) return;
      done += static_cast<size_t>(more);
    }
  }
};

}  // namespace

std::string MakeNonce() {
  RandomSeed seed;
  boost::mt19937 engine(seed);
  return to_string(boost::uuids::basic_random_generator<boost::mt19937>(engine)());
}

}  // namespace SSO
}  // namespace QOVA
