// SPDX-License-Identifier: BSD-2-Clause
/// Finds and loads TA images.
///
/// An image is the file UUID.so, the UUID in lower case, in the first of these folders that has
/// it: the one that a test named; "../ta" beside the folder of the running program; "otrp/ta"
/// beside this library, where installing puts them; $OTRP_TA_DIR.
#ifndef TEE_LOADER_H
#define TEE_LOADER_H

#include "ta_instance.h"

namespace tee {

/// Loads the image of `ta`, with globals of its own: an image that some live instance already has
/// is loaded again, from a copy. Throws TEE_ERROR_ITEM_NOT_FOUND when there is no image,
/// TEE_ERROR_BAD_FORMAT for what is none, TEE_ERROR_NOT_SUPPORTED when it asks for more than this
/// TEE offers.
Program load_program(const TEE_UUID &ta);

}  // namespace tee

#endif
