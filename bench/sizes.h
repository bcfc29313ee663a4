// The sizes for which cost is measured: tokens, key sets, answers.
#pragma once

#include <cstddef>

namespace bench {

constexpr std::size_t kTokenSizes[] = {1 << 10, 1 << 12, 1 << 14, 1 << 16, 1 << 18, 1 << 20};
constexpr int kKeyCounts[] = {1, 10, 100, 300, 1000};
constexpr std::size_t kAnswerSizes[] = {1 << 10, 10 << 10, 100 << 10, 1 << 20, 10 << 20};

}  // namespace bench
