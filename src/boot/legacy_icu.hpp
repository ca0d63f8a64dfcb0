#pragma once

namespace boot {

/// Moves the legacy ICU link to the live one's place, unless something is there, and deletes it either way, even after
/// a failed copy. A dangling link counts as absent. Failures give warnings only.
void migrate_legacy_icu_link() noexcept;

}  // namespace boot
