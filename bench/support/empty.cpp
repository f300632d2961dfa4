// SPDX-License-Identifier: MIT
// The least that can be opened.
extern "C" void empty() {}
