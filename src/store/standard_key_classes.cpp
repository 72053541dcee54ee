#include "store/standard_key_classes.h"

#include "store/data_ark_record.h"
#include "store/key_names.h"

namespace quorvel {

namespace {

constexpr StaticText kBackupVersion = "2.0";

}  // namespace

void apply_standard_key_classes(DataArk* ark) noexcept {
  const struct {
    PropertyValue domain;
    PropertyValue key;
    unsigned key_class;
    PropertyValue value = {};
  } marks[] = {
      {nullptr, keys::kDebugDockPresent, kVolatileClass},
      {nullptr, keys::kIntegratedCircuitCardIdentity, kMemoryOnlyClass},
      {nullptr, keys::kInternationalMobileSubscriberIdentity, kMemoryOnlyClass},
      {keys::kPairedHostsDomain, nullptr, kMemoryOnlyClass},
      {nullptr, keys::kSIMStatus, kMemoryOnlyClass},
      {keys::kBackupDomain, keys::kVersion, kMemoryOnlyClass, kBackupVersion},
      {nullptr, keys::kPhoneNumber, kMemoryOnlyClass},
      {keys::kDiskUsageDomain, keys::kMobileApplicationUsage, kMemoryOnlyClass},
      {keys::kFactoryDiskUsageDomain, keys::kMobileApplicationUsage, kMemoryOnlyClass},
      {nullptr, keys::kUntrustedHostBUID, kVolatileClass},
  };
  for (const auto& mark : marks) {
    data_ark_add_to_class(ark, mark.domain, mark.key, mark.key_class);
    if (mark.value) data_ark_set(ark, mark.domain, mark.key, mark.value);
  }
}

}  // namespace quorvel
