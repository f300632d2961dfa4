// SPDX-License-Identifier: MIT
#include "servant.h"

#include <kel/exceptions/standard.h>
#include <kel/services/environment.h>

#include <cstring>
#include <new>
#include <sstream>

#include "trace.h"

namespace names {

// A request that finds no memory fails like any other; the reply to that needs little.
std::string Servant::answer(const std::string& text) {
    CORBA_Environment* const environment = CORBA::current_environment();
    environment->clear();
    try {
        std::ostringstream stream;
        KELostream reply(stream);
        reply << kOk;
        carry_out(read_request(text), reply);
        return stream.str();
    } catch (CORBA_Exception& failure) {
        environment->exception(failure._deep_copy());
    } catch (const std::bad_alloc&) {
        environment->exception(new CORBA_NO_MEMORY);
    }
    NAMES_TRACE(kDispatch) << "raised " << environment->exception()->_name() << endl;
    return exception_reply(*environment->exception());
}

std::string exception_reply(const CORBA_Exception& failure) {
    std::ostringstream stream;
    KELostream reply(stream);
    reply << kException << failure;
    return stream.str();
}

void Servant::carry_out(const Request& request, KELostream& reply) {
    const char* const operation = request.operation.in();
    const char* const context = request.context.in();
    const char* const name = request.name.in();
    NAMES_TRACE(kDispatch) << operation << " [" << context << "] [" << name << "]" << endl;
    if (std::strcmp(operation, "list") == 0) {
        const std::vector<std::string> found = _store.list(context);
        reply << static_cast<unsigned long>(found.size());
        for (const std::string& entry : found) reply << entry.c_str();
        return;
    }
    if (*name == '\0') throw CORBA_BAD_PARAM(0, CORBA::COMPLETED_NO, "the name is empty");
    if (std::strcmp(operation, "bind") == 0) {
        _store.bind(context, name, request.value.in());
    } else if (std::strcmp(operation, "rebind") == 0) {
        _store.rebind(context, name, request.value.in());
    } else if (std::strcmp(operation, "resolve") == 0) {
        reply << _store.resolve(context, name).c_str();
    } else if (std::strcmp(operation, "unbind") == 0) {
        _store.unbind(context, name);
    } else {
        throw CORBA_BAD_OPERATION(0, CORBA::COMPLETED_NO, "there is no such operation");
    }
}

}  // namespace names
