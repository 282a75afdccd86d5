# SPDX-License-Identifier: BSD-2-Clause
# What the folders of the two trusted applications share: their settings, the headers that are
# generated before the kit's make takes over, and the flags of their sources. The flags that say for
# which machine, and how position independent, code is made are the kit's.
root := $(patsubst %/kit/ta.mk,%,$(realpath $(lastword $(MAKEFILE_LIST))))
include $(root)/kit/uuids.mk
O ?= out
OTRP_CA_TSM_KEY ?= $(root)/keys/dev-ca-tsm.pub.pem

# Paths may be relative to where make was called, though it works in the folder.
given = $(abspath $(firstword $(wildcard $(PWD)/$1 $1) $1))
kit := $(call given,$(TA_DEV_KIT_DIR))
ca-tsm-key := $(call given,$(OTRP_CA_TSM_KEY))
ifeq ($(wildcard $(kit)/mk/ta_dev_kit.mk),)
  $(error TA_DEV_KIT_DIR must name a kit, a folder with mk/ta_dev_kit.mk (is "$(TA_DEV_KIT_DIR)"))
endif
override TA_DEV_KIT_DIR := $(kit)
export TA_DEV_KIT_DIR

# generate(HEADERS): writes these headers to $(generated), before anything is built.
generated = $(shell realpath -m --relative-to=. $(O))/generated
generate = $(if $(filter clean,$(MAKECMDGOALS)),,$(shell \
  OTRP_TA_UUID=$(OTRP_TA_UUID) OTRP_CORVEL_UUID=$(OTRP_CORVEL_UUID) OTRP_CA_TSM_KEY='$(ca-tsm-key)' \
  JSMN_INCLUDE_DIR='$(JSMN_INCLUDE_DIR)' $(root)/kit/generate $(generated) $1)$(if \
  $(filter-out 0,$(.SHELLSTATUS)),$(error the headers of $(CURDIR) cannot be generated)))

ta-cxxflags := -std=c++20 -ffreestanding -fbuiltin -nostdinc++ -fno-exceptions -fno-rtti \
  -fno-threadsafe-statics -fno-unwind-tables -fno-asynchronous-unwind-tables \
  -Os -ffunction-sections -fdata-sections -Wno-psabi -Wno-format
