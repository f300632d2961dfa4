// SPDX-License-Identifier: MIT
#include <kel/version.h>

const char* kel_version() { return KEL_VERSION; }

int kel_version_number() { return KEL_VERSION_NUMBER; }
