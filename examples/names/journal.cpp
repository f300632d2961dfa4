// SPDX-License-Identifier: MIT
#include "journal.h"

#include <kel/exceptions/standard.h>
#include <kel/services/load_library.h>

namespace names {

namespace {

OpenJournal offered = nullptr;

}  // namespace

Journal::~Journal() = default;

void offer_journal(OpenJournal open) { offered = open; }

std::unique_ptr<Journal> load_journal(const char* library, const char* file) {
    KELLoadLibrary::instance()->Load(library);
    if (offered == nullptr) throw CORBA_INITIALIZE(0, CORBA::COMPLETED_NO, "there is no journal plug-in");
    return offered(file);
}

}  // namespace names
