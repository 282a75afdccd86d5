# SPDX-License-Identifier: BSD-2-Clause
srcs-y += $(wildcard crypto/*.cpp frame/*.cpp operations/*.cpp security/*.cpp state/*.cpp)
global-incdirs-y += . include ../kit $(generated)
cxxflags-y += $(ta-cxxflags)
