// Loads and unloads what its arguments say, with the shared loader:
//
//     driver load codec unload libcodec_r.so unload-all -
//
// SPDX-License-Identifier: MIT
#include <kel/services/load_library.h>

#include <string>

int main(int argc, char** argv) {
    KELLoadLibrary* const loader = KELLoadLibrary::instance();
    for (int i = 1; i + 1 < argc; i += 2) {
        const std::string action = argv[i];
        if (action == "load") loader->Load(argv[i + 1]);
        if (action == "unload") loader->Unload(argv[i + 1]);
        if (action == "unload-all") loader->UnloadAll();
    }
    return 0;
}
