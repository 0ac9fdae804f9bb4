#include "platform/util/feature_state.h"

#include <utility>

namespace {

std::array<uint8_t, kFeatureCount> gFlags{};

template <size_t... I>
constexpr std::array<uint8_t*, kFeatureCount> MakePointers(std::index_sequence<I...>) {
  return {&gFlags[I]...};
}

}  // namespace

const std::array<uint8_t*, kFeatureCount> FeatureList =
    MakePointers(std::make_index_sequence<kFeatureCount>{});

void FeatureState_Init() { gFlags.fill(0); }

void FeatureState_Set(size_t index, bool enabled) {
  if (index < kFeatureCount) gFlags[index] = enabled ? 1 : 0;
}
