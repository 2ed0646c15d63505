// Stage 1: the protection of the data store.

#ifndef KELVANE_STARTUP_PREPARE_STORE_H_
#define KELVANE_STARTUP_PREPARE_STORE_H_

namespace kelvane {

// Opens and closes the directories of the store and of its downloads. On a system that has
// data-protection classes, this is where both would get the one whose files stay accessible in
// every lock state of the device. Whatever fails is ignored. Throws nothing.
void prepare_store();

}  // namespace kelvane

#endif  // KELVANE_STARTUP_PREPARE_STORE_H_
