// Stage 1: the protection of the data store.

#ifndef KELVANE_STARTUP_PREPARE_STORE_H_
#define KELVANE_STARTUP_PREPARE_STORE_H_

namespace kelvane {

// Puts the directories of the store and of its downloads, where they exist, into the
// data-protection class whose files stay accessible in every lock state of the device. Whatever
// fails is ignored.
void prepare_store();

}  // namespace kelvane

#endif  // KELVANE_STARTUP_PREPARE_STORE_H_
