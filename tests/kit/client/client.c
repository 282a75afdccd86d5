/* SPDX-License-Identifier: BSD-2-Clause
 * The library behind this kit's Client API. Its TEE is known by no name and by "second"; the agent
 * there tells that name as its device ID, and has panicked when it is asked for anything else. */
#include <string.h>
#include <tee_client_api.h>

TEEC_Result TEEC_InitializeContext(const char *name, TEEC_Context *context) {
  if (name != NULL && strcmp(name, "second") != 0) return TEEC_ERROR_ITEM_NOT_FOUND;
  context->channel = 3;
  context->name = name;
  return TEEC_SUCCESS;
}

void TEEC_FinalizeContext(TEEC_Context *context) {
  context->channel = -1;
}

TEEC_Result TEEC_OpenSession(TEEC_Context *context, TEEC_Session *session,
                             const TEEC_UUID *destination, uint32_t connectionMethod,
                             const void *connectionData, TEEC_Operation *operation,
                             uint32_t *returnOrigin) {
  (void)connectionData;
  (void)operation;
  *returnOrigin = TEEC_ORIGIN_TEE;
  if (destination->timeLow == 0 || connectionMethod != TEEC_LOGIN_PUBLIC) return TEEC_ERROR_GENERIC;
  session->context = context;
  session->number = 1;
  return TEEC_SUCCESS;
}

void TEEC_CloseSession(TEEC_Session *session) {
  session->context = NULL;
}

TEEC_Result TEEC_InvokeCommand(TEEC_Session *session, uint32_t commandID, TEEC_Operation *operation,
                               uint32_t *returnOrigin) {
  const char *id = session->context->name == NULL ? "first" : session->context->name;
  TEEC_TempMemoryReference *output = &operation->params[1].tmpref;
  *returnOrigin = TEEC_ORIGIN_TEE;
  if (commandID != 2 || output->size < strlen(id)) return TEEC_ERROR_TARGET_DEAD;
  *returnOrigin = TEEC_ORIGIN_TRUSTED_APP;
  output->size = strlen(id);
  memcpy(output->buffer, id, output->size);
  return TEEC_SUCCESS;
}
