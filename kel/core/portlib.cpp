// SPDX-License-Identifier: MIT
#include <kel/core/portlib.h>

std::int32_t KELPortLibManager::debug_level = 0;
std::int32_t KELPortLibManager::inited = 0;
char KELPortLibManager::ifname[80] = "eth0";

void KELPortLibManager::initialize() { inited = 1; }
