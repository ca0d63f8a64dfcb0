#pragma once

namespace boot {

/// Moves the ICU link from its place in earlier releases, "/var/db/icutz", to "/var/db/timezone/icutz", unless
/// something is there already; the legacy link is deleted either way. A link whose target is missing counts as absent,
/// at both places. The target is copied as it is, even if it is relative. Failures give warnings only; after a failed
/// copy the legacy link is deleted all the same.
void migrate_legacy_icu_link() noexcept;

}  // namespace boot
