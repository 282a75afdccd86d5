// SPDX-License-Identifier: BSD-2-Clause
/// Brings an SD's entry in the in-memory DSI up to its stored record.
#ifndef REFRESH_SD_H
#define REFRESH_SD_H

#include "failure.h"
#include "state/dsi.h"

/// Removes the entry and loads it again, so that it ends up last. A failure of the second step
/// leaves the SD out of the DSI. Logs under the name of the operation `caller`.
[[nodiscard]] inline TEE_Result refresh_sd_in_dsi(const char *caller, const char *sdname) {
  TRY_LOG_AS(caller, remove_g_dsi_sdl_item_by_sdname(sdname),
             "remove_g_dsi_sdl_item_by_sdname fail error code: 0x%x");
  TRY_LOG_AS(caller, load_g_dsi_sdl_item_by_sdname(sdname),
             "load_g_dsi_sdl_item_by_sdname fail error code: 0x%x");
  return TEE_SUCCESS;
}

#endif
