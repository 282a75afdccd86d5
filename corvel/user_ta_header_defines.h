// SPDX-License-Identifier: BSD-2-Clause
/// What a kit of the make kind publishes of the key service. UUID, sizes, version and description
/// have the same names there.
#ifndef USER_TA_HEADER_DEFINES_H
#define USER_TA_HEADER_DEFINES_H

#include <ta_config.h>

#define TA_FLAGS TA_HEADER_FLAGS

#endif
