#pragma once

namespace boot {

/// Copies the legacy ICU link to the place of the live ICU link, if nothing exists there, and deletes the legacy link,
/// even after a failed copy. A dangling link counts as missing in both places. Failures only cause warnings.
void migrate_legacy_icu_link() noexcept;

}  // namespace boot
