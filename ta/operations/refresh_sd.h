// SPDX-License-Identifier: BSD-2-Clause
/// Lets the DSI show an SD as it is stored now.
#ifndef REFRESH_SD_H
#define REFRESH_SD_H

#include "failure.h"
#include "state/dsi.h"

/// Takes the entry out and makes a new one, the last, from the record. When that cannot be made the
/// DSI is without the SD until the next instance. Logs under the name of the operation `as`.
[[nodiscard]] inline TEE_Result refresh_sd_in_dsi(const char *sdname,
                                                  const char *as = __builtin_FUNCTION()) {
  TRY_LOG_AS(as, remove_g_dsi_sdl_item_by_sdname(sdname),
             "remove_g_dsi_sdl_item_by_sdname fail error code: 0x%x");
  TRY_LOG_AS(as, load_g_dsi_sdl_item_by_sdname(sdname),
             "load_g_dsi_sdl_item_by_sdname fail error code: 0x%x");
  return TEE_SUCCESS;
}

#endif
