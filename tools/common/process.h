// SPDX-License-Identifier: BSD-2-Clause
/// What a program that holds keys does before anything else.
#ifndef COMMON_PROCESS_H
#define COMMON_PROCESS_H

namespace tools {

/// Takes the place of standard streams that the caller has closed, so that no file which is opened
/// later, a lock or a database, gets their number and with it what the program prints. Reading or
/// writing such a stream fails.
///
/// Forbids core dumps, and other processes of the same user to look into this one: keys lie in its
/// memory.
void prepare_process();

}  // namespace tools

#endif
