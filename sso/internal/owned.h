// Owners of what the C libraries hand out.
#pragma once

#include <cstdlib>
#include <memory>

namespace QOVA {
namespace SSO {

// Releaser<F> is the deleter that calls the library's own release function F.
template <auto Release>
struct Releaser {
  template <typename T>
  void operator()(T* resource) const {
    Release(resource);
  }
};

// Memory of malloc and calloc.
using CText = std::unique_ptr<char, Releaser<std::free>>;

}  // namespace SSO
}  // namespace QOVA
