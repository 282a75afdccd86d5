// SPDX-License-Identifier: BSD-2-Clause
/// Parameters of the Client API as the Internal Core API knows them.
#ifndef TEE_CLIENT_PARAMS_H
#define TEE_CLIENT_PARAMS_H

#include <tee_client_api.h>

#include "host_device.h"

namespace tee {

/// Types that the Client API does not define reach the trusted application as they are, without a
/// parameter, for it is the one to judge them. `operation` may be NULL: no parameters. Throws
/// TEE_ERROR_BAD_PARAMETERS for a memory reference that no trusted application could take.
void take_params(const TEEC_Operation *operation, Message &message);

/// Hands out values and sizes as the trusted application left them.
void give_back_params(const Message &message, TEEC_Operation *operation);

}  // namespace tee

#endif
