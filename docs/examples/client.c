// SPDX-License-Identifier: BSD-2-Clause
// client STATE MESSAGE_ID <request >response: carries a TSM's request to the agent of the device in
// STATE, and its answer back. The image of an InstallTA or UpdateTA is left where the answer is.
//
//     cc client.c -o client $(pkg-config --cflags --libs otrp-tee)
#include <otrp.h>
#include <stdio.h>
#include <stdlib.h>
#include <tee_client_api.h>

enum { kMaxRequest = 8 << 20, kCapacity = 12 << 20 };

static int fail(const char *what, uint32_t code) {
  fprintf(stderr, "client: %s: 0x%08x; `otrp-tsm explain 0x%08x` says what it means\n", what, code,
          code);
  return 1;
}

// Sends the frame, and prints the response in the answer.
static int send(TEEC_Session *agent, void *frame, size_t frame_len, void *out) {
  TEEC_Operation operation = {.paramTypes = OTRP_PARAM_TYPES};
  operation.params[0].tmpref = (TEEC_TempMemoryReference){frame, frame_len};
  operation.params[1].tmpref = (TEEC_TempMemoryReference){out, kCapacity};
  const TEEC_Result result = TEEC_InvokeCommand(agent, OTRP_COMMAND_MESSAGE, &operation, NULL);
  if (result != TEEC_SUCCESS) return fail("the command failed", result);

  struct otrp_answer answer;
  if (!otrp_read_answer(out, operation.params[1].tmpref.size, kCapacity, &answer)) {
    return fail("the answer is malformed", TEEC_ERROR_BAD_FORMAT);
  }
  if (answer.text_len == 0) return fail("no response", answer.status);
  if (answer.image != NULL) fprintf(stderr, "client: TA image of %u bytes\n", answer.image_len);
  return fwrite(answer.text, 1, answer.text_len, stdout) == answer.text_len ? 0 : 1;
}

static int open_and_send(const char *state, void *frame, size_t frame_len, void *out) {
  const TEEC_UUID uuid = OTRP_AGENT_UUID;
  TEEC_Context device;
  TEEC_Session agent;
  TEEC_Result result = TEEC_InitializeContext(state, &device);
  if (result != TEEC_SUCCESS) return fail("cannot open the device", result);
  result = TEEC_OpenSession(&device, &agent, &uuid, TEEC_LOGIN_PUBLIC, NULL, NULL, NULL);
  int exit_code = 1;
  if (result == TEEC_SUCCESS) {
    exit_code = send(&agent, frame, frame_len, out);
    TEEC_CloseSession(&agent);
  } else {
    fail("cannot reach the agent", result);
  }
  TEEC_FinalizeContext(&device);
  return exit_code;
}

int main(int argc, char **argv) {
  if (argc != 3) return fputs("usage: client STATE MESSAGE_ID <request >response\n", stderr), 2;
  uint8_t *request = malloc(kMaxRequest);
  uint8_t *frame = malloc(OTRP_FRAME_LEN + kMaxRequest);
  uint8_t *out = malloc(kCapacity);
  int exit_code = 1;
  if (request != NULL && frame != NULL && out != NULL) {
    const size_t len = fread(request, 1, kMaxRequest, stdin);
    otrp_put_frame(frame, (uint32_t)strtoul(argv[2], NULL, 0), request, (uint32_t)len);
    exit_code = open_and_send(argv[1], frame, OTRP_FRAME_LEN + len, out);
  }
  free(out);
  free(frame);
  free(request);
  return exit_code;
}
