// How services find a provider's key server client, and drop it when the
// provider changes. The providers state is the real implementation; tests
// hand services a fake.
#pragma once

#include <memory>
#include <string>

#include "kms/kms.h"

namespace Zyrd::State {

class ProviderLookup {
 public:
  virtual ~ProviderLookup() = default;
  // The provider's client, or null when the provider does not exist. The
  // caller holds the returned handle for the duration of its request.
  virtual std::shared_ptr<Kms::Kms> GetProvider(const std::string& name) = 0;
  // Drops the provider's client after a change to its configuration or trust
  // material; the next lookup builds a fresh one from the store.
  virtual void DeleteProviderFromState(const std::string& name) = 0;
  // Drops every client (after the whole configuration was replaced).
  virtual void DeleteAllProvidersFromState() = 0;
};

}  // namespace Zyrd::State
