# SPDX-License-Identifier: BSD-2-Clause
# Who the trusted applications are, unless a deployment says otherwise; CMake reads this, too.
OTRP_TA_UUID ?= c7acaae4-686e-41ee-97d4-49ed38960151
OTRP_CORVEL_UUID ?= c452d759-895e-4c34-ba77-c7c51f37909f
