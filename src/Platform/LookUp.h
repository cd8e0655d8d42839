#pragma once

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <utility>

namespace Varnholt::Platform {

/// What a table has beside `key`; `others` where it does not have the key.
template <class Key, class Meaning, std::size_t Size>
constexpr Meaning LookUp(const std::pair<Key, Meaning> (&table)[Size], Key key, Meaning others) {
    const auto* const found = std::ranges::find(table, key, &std::pair<Key, Meaning>::first);
    return found != std::end(table) ? found->second : others;
}

}  // namespace Varnholt::Platform
