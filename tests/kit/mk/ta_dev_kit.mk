# SPDX-License-Identifier: BSD-2-Clause
# A kit's make, in small: builds the trusted application of the folder that includes it.
O ?= .
include sub.mk
kit-flags := -Os -fpie -Wall -Wextra -Werror -MMD -include $(TA_DEV_KIT_DIR)/include/kit_config.h \
  $(addprefix -I,$(global-incdirs-y) . $(TA_DEV_KIT_DIR)/include)
objects := $(patsubst %,$(O)/%.o,$(basename $(srcs-y)) ta_header)

all: $(O)/$(BINARY).ta
$(O)/$(BINARY).ta: $(objects)
	$(CROSS_COMPILE)gcc -nostdlib -static-pie -Wl,--gc-sections,-e,ta_entry_points,-u,ta_header \
	  -o $@ $^ $(addprefix -L,$(libdirs) $(TA_DEV_KIT_DIR)/lib) $(addprefix -l,$(libnames)) \
	  -ltee -lgcc -lkit
$(O)/%.o: %.cpp
	@mkdir -p $(@D)
	$(CROSS_COMPILE)g++ $(kit-flags) $(cxxflags-y) -c $< -o $@
$(O)/ta_header.o: $(TA_DEV_KIT_DIR)/src/ta_header.c user_ta_header_defines.h
	@mkdir -p $(@D)
	$(CROSS_COMPILE)gcc $(kit-flags) -c $< -o $@
clean:
	rm -rf $(objects) $(objects:.o=.d) $(O)/$(BINARY).ta
-include $(objects:.o=.d)
.PHONY: all clean
