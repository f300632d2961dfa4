// names_client: sends the requests of a file, or of standard input, to a names_server and prints what
// comes of each.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/explain.h>
#include <kel/exceptions/standard.h>
#include <kel/os/portable.h>

#include <cstring>
#include <fstream>
#include <iomanip>
#include <iostream>
#include <map>
#include <sstream>

#include "channel.h"
#include "exceptions.h"
#include "options.h"
#include "request_line.h"

namespace {

const char* const kUsage =
    "usage: names_client [options] [file]\n"
    "  -NShost NAME       where the service is (127.0.0.1)\n"
    "  -NSport NUMBER     its port\n"
    "  -NStimeout NUMBER  milliseconds to wait for it, 0 for ever (5000)\n"
    "  -NSbind NAME       local address to connect from\n"
    "  -NScontext NAME    the context that the names belong to (main)\n"
    "Without a file the requests come from standard input, one a line:\n"
    "  bind NAME VALUE, rebind NAME VALUE, resolve NAME, unbind NAME, list\n";

// The result of an operation that the service carried out.
std::string result_of(const names::Request& request, KEListream& in, std::istream& text) {
    CORBA_String_var entry;
    if (std::strcmp(request.operation, "resolve") == 0) {
        names::read_string(in, text, entry);
        return names::quoted(entry.in());
    }
    if (std::strcmp(request.operation, "list") != 0) return "ok";
    unsigned long count = 0;
    in >> count;
    std::string all = std::to_string(count) + (count == 1 ? " name" : " names");
    for (unsigned long i = 0; i < count; ++i) {
        names::read_string(in, text, entry);
        all += ' ' + names::quoted(entry.in());
    }
    return all;
}

std::string describe(const CORBA_SystemException& e) {
    static const char* const statuses[] = {"completed", "not completed", "maybe completed"};
    std::ostringstream text;
    text << e._name() << ", minor 0x" << std::hex << e.minor() << ", "
         << (e.completed() <= CORBA::COMPLETED_MAYBE ? statuses[e.completed()] : "status unknown");
    return text.str();
}

class Client {
public:
    Client(names::Channel& channel, const std::string& context) : _channel(channel), _context(context) {}

    // Sends every line but the empty ones and those that begin with '#'.
    void send_lines(std::istream& lines) {
        std::string line;
        while (std::getline(lines, line)) {
            if (!line.empty() && line[0] != '#') send_line(line);
        }
    }

    void print_summary() const {
        for (const auto& outcome : _outcomes) {
            std::cout << std::setw(6) << outcome.second << "  " << outcome.first << '\n';
        }
    }

private:
    // The failures of the service are caught by their classes; those that end the conversation, which
    // come from this process and not from a reply, are left to main.
    void send_line(const std::string& line) {
        names::Request request;
        const bool understood = names::parse(line, request);
        const std::string reply = _channel.call(understood ? message_of(request) : line);
        try {
            print(line, "ok", outcome_of(request, reply));
        } catch (const names::NotFound& e) {
            print(line, e._name(), "not found: " + names::quoted(e.name()));
        } catch (const names::AlreadyBound& e) {
            print(line, e._name(), "already bound: " + names::quoted(e.name()));
        } catch (const CORBA::BAD_PARAM& e) {
            print(line, e._name(), "bad parameter: " + describe(e));
        } catch (const CORBA::MARSHAL& e) {
            print(line, e._name(), "not understood: " + describe(e));
        } catch (const CORBA_SystemException& e) {
            print(line, e._name(), describe(e));
        }
    }

    std::string message_of(names::Request& request) const {
        request.context = _context.c_str();
        std::ostringstream text;
        KELostream out(text);
        names::write(out, request);
        return text.str();
    }

    // The result in words; a failure is raised as the exception that the service raised.
    static std::string outcome_of(const names::Request& request, const std::string& reply) {
        std::istringstream text(reply);
        KEListream in(text);
        unsigned long status = names::kException;
        in >> status;
        if (status == names::kOk) return result_of(request, in, text);
        CORBA_Exception* failure = nullptr;
        in >> failure;
        const CORBA_Exception_var owner(failure);
        failure->_raise();
        return std::string();
    }

    void print(const std::string& line, const char* kind, const std::string& outcome) {
        ++_outcomes[kind];
        std::cout << std::setw(5) << ++_count << "  " << names::shortened(line) << "\n       -> " << outcome
                  << '\n';
    }

    names::Channel& _channel;
    const std::string _context;
    unsigned long _count = 0;
    std::map<std::string, unsigned long> _outcomes;
};

void run(names::Options& options, const char* file) {
    const std::string host = options.text("NShost", "127.0.0.1");
    const long port = options.number("NSport", 0, 1, 65535);
    const long timeout = options.number("NStimeout", 5000, 0, 24 * 3600 * 1000);
    const std::string bind_name = options.text("NSbind", "");
    const std::string context = options.text("NScontext", "main");
    options.refuse_others();

    std::ifstream opened;
    if (file != nullptr) opened.open(file);
    if (file != nullptr && !opened) throw std::runtime_error(std::string("cannot read ") + file);
    names::Channel channel(host.c_str(), static_cast<unsigned short>(port), static_cast<unsigned>(timeout),
                           bind_name.c_str());
    Client client(channel, context);
    client.send_lines(file != nullptr ? opened : std::cin);
    client.print_summary();
}

}  // namespace

int main(int argc, char** argv) {
    try {
        names::Options options(argc, argv);
        const bool help = argc > 1 && std::strcmp(argv[1], "--help") == 0;
        if (help) {
            std::cout << kUsage;
            return 0;
        }
        if (argc > 2) throw names::UsageError("there is more than one file");
        run(options, argc > 1 ? argv[1] : nullptr);
        return 0;
    } catch (const names::UsageError& mistake) {
        std::cerr << "names_client: " << mistake.what() << '\n' << kUsage;
    } catch (const CORBA_Exception& failure) {
        const CORBA_String_var why(kel_explain(failure));
        std::cerr << "names_client: cannot go on\n" << failure << why.in() << '\n';
    } catch (const std::exception& failure) {
        std::cerr << "names_client: " << failure.what() << '\n';
    }
    return 1;
}
