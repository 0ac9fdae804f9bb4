// Host feature switches.
//
// FeatureList holds one pointer to a flag byte per feature; a byte of 0 means
// the feature is off. FeatureState_Init resets every flag to off; the runtime
// then sets the flags that its configuration names (see runtime/app.h).
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

inline constexpr size_t kFeatureCount = 256;
// Reading a provider's KMIP credential back through the API.
inline constexpr size_t kFeatureCredentialGet = 146;

extern const std::array<uint8_t*, kFeatureCount> FeatureList;

void FeatureState_Init();
void FeatureState_Set(size_t index, bool enabled);
