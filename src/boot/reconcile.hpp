#pragma once

/// What happens at a boot: one dataset is made live, the links of earlier releases and the local time link are
/// repaired.
namespace boot {

/// Reconciles the live links with the data that there is: decides between the dataset that is live, the latest
/// installed one and the system partition's, makes one of them live, and repairs the links around them.
///
/// Returns false when neither a dataset nor the fallback could be made live, or the local time link could not be
/// repaired; each is attempted whatever became of the other. A failure has been reported, unless memory has run out.
bool reconcile() noexcept;

}  // namespace boot
