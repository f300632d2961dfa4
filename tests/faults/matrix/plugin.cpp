// A library to load for real. It does nothing.
//
// SPDX-License-Identifier: MIT
extern "C" __attribute__((visibility("default"))) int matrix_plugin();
extern "C" int matrix_plugin() { return 42; }
