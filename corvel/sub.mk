# SPDX-License-Identifier: BSD-2-Clause
srcs-y += $(wildcard *.cpp)
global-incdirs-y += . ../ta/include ../kit $(generated)
cxxflags-y += $(ta-cxxflags)
