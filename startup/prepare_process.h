// Before the stages: independence of whatever started the process.

#ifndef KELVANE_STARTUP_PREPARE_PROCESS_H_
#define KELVANE_STARTUP_PREPARE_PROCESS_H_

namespace kelvane {

// Makes the run end by exit, and with the same links, where little is left to it:
//
//  1. Standard input and output, which the run does not use, are closed. So the files that it opens
//     find room even where the process may have three descriptors; and the one that it writes, open
//     alone, never takes the number of a closed standard error, to receive the warnings.
//  2. Where memory runs out and no handler can catch it, be it an exception that cannot be raised
//     or a SIGSEGV in the C library, the run ends with status 1 after the warning "Could not go
//     on". So does a fault of the program.
//
// It calls prepare_warnings().
void prepare_process();

}  // namespace kelvane

#endif  // KELVANE_STARTUP_PREPARE_PROCESS_H_
