// SPDX-License-Identifier: BSD-2-Clause
#include "client_params.h"

#include "error.h"

namespace tee {

namespace {

Error bad_reference(const char *why) {
  return {TEE_ERROR_BAD_PARAMETERS, std::string("memory reference ") + why};
}

TEE_Param memref(void *buffer, size_t size) {
  if (size > UINT32_MAX) throw bad_reference("of more than 4 GiB");
  if (buffer == nullptr && size != 0) throw bad_reference("with a size but no buffer");
  return {.memref = {buffer, static_cast<TEE_LengthType>(size)}};
}

const TEEC_SharedMemory &parent_of(const TEEC_RegisteredMemoryReference &reference) {
  if (reference.parent == nullptr) throw bad_reference("without shared memory");
  return *reference.parent;
}

// The flags of shared memory and the directions of a parameter are the same bits.
uint32_t memref_type(uint32_t directions) {
  return (TEE_PARAM_TYPE_MEMREF_INPUT - TEEC_MEM_INPUT) + directions;
}

uint32_t take_whole(const TEEC_RegisteredMemoryReference &reference, TEE_Param &param) {
  const TEEC_SharedMemory &parent = parent_of(reference);
  const uint32_t directions = parent.flags & (TEEC_MEM_INPUT | TEEC_MEM_OUTPUT);
  if (directions == 0) throw bad_reference("to shared memory without a direction");
  param = memref(parent.buffer, parent.size);
  return memref_type(directions);
}

uint32_t take_part(const TEEC_RegisteredMemoryReference &reference, uint32_t client_type,
                   TEE_Param &param) {
  const TEEC_SharedMemory &parent = parent_of(reference);
  const uint32_t directions = client_type - TEEC_MEMREF_PARTIAL_INPUT + TEEC_MEM_INPUT;
  if ((directions & ~parent.flags) != 0) throw bad_reference("against the flags of its memory");
  if (parent.buffer == nullptr || reference.offset > parent.size ||
      reference.size > parent.size - reference.offset) {
    throw bad_reference("past the end of its memory");
  }
  param = memref(static_cast<uint8_t *>(parent.buffer) + reference.offset, reference.size);
  return memref_type(directions);
}

// Returns the type under which the trusted application gets the parameter.
uint32_t take(uint32_t client_type, const TEEC_Parameter &from, TEE_Param &param) {
  switch (client_type) {
    case TEEC_VALUE_INPUT:
    case TEEC_VALUE_INOUT:
      param.value = {from.value.a, from.value.b};
      return client_type;
    case TEEC_MEMREF_TEMP_INPUT:
    case TEEC_MEMREF_TEMP_OUTPUT:
    case TEEC_MEMREF_TEMP_INOUT:
      param = memref(from.tmpref.buffer, from.tmpref.size);
      return client_type;
    case TEEC_MEMREF_WHOLE:
      return take_whole(from.memref, param);
    case TEEC_MEMREF_PARTIAL_INPUT:
    case TEEC_MEMREF_PARTIAL_OUTPUT:
    case TEEC_MEMREF_PARTIAL_INOUT:
      return take_part(from.memref, client_type, param);
    default:
      return client_type;
  }
}

void give_back(const Message &message, unsigned i, uint32_t client_type, TEEC_Parameter &to) {
  const TEE_Param &param = message.params[i];
  switch (TEE_PARAM_TYPE_GET(message.types, i)) {
    case TEE_PARAM_TYPE_VALUE_OUTPUT:
    case TEE_PARAM_TYPE_VALUE_INOUT:
      to.value = {param.value.a, param.value.b};
      break;
    case TEE_PARAM_TYPE_MEMREF_OUTPUT:
    case TEE_PARAM_TYPE_MEMREF_INOUT:
      (client_type < TEEC_MEMREF_WHOLE ? to.tmpref.size : to.memref.size) = param.memref.size;
      break;
  }
}

}  // namespace

void take_params(const TEEC_Operation *operation, Message &message) {
  if (operation == nullptr) return;
  message.types = operation->paramTypes & ~0xFFFFu;
  for (unsigned i = 0; i < 4; ++i) {
    const uint32_t client_type = TEE_PARAM_TYPE_GET(operation->paramTypes, i);
    message.types |= take(client_type, operation->params[i], message.params[i]) << (4 * i);
  }
}

void give_back_params(const Message &message, TEEC_Operation *operation) {
  if (operation == nullptr) return;
  for (unsigned i = 0; i < 4; ++i) {
    give_back(message, i, TEE_PARAM_TYPE_GET(operation->paramTypes, i), operation->params[i]);
  }
}

}  // namespace tee
