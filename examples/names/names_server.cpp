// names_server: keeps names bound to values and serves them to any number of clients.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/explain.h>
#include <kel/exceptions/standard.h>
#include <kel/os/portable.h>
#include <sys/resource.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <iostream>

#include "journal.h"
#include "options.h"
#include "poll_server.h"
#include "thread_server.h"
#include "trace.h"

namespace {

const char* const kUsage =
    "usage: names_server [options]\n"
    "  -NShost NAME           address to listen on (127.0.0.1)\n"
    "  -NSport NUMBER         first port to try, 0 for any free one (0)\n"
    "  -NSrange NUMBER        how many ports after the first to try (0)\n"
    "  -NSmode poller|threads one thread for all clients, or one for each (poller)\n"
    "  -NSapi poll|select     how to wait for the clients (poll)\n"
    "  -NSjournal FILE        keep the bindings in this file\n"
    "  -NSplugin NAME         library that keeps them (nsjournal)\n"
    "  -NStrace LIST          all, or some of transport,dispatch,marshalling\n"
    "  -NStracefile FILE      where to trace to (standard output)\n";

names::Server* running = nullptr;

void on_stop_signal(int) {
    const int error = errno;
    running->stop();
    errno = error;
}

KELPoll::SupportedAPIs api_called(const std::string& name) {
    if (name == "poll") return KELPoll::API_POLL;
    if (name == "select") return KELPoll::API_SELECT;
    throw names::UsageError("-NSapi is poll or select");
}

bool wants_threads(const std::string& mode) {
    if (mode != "poller" && mode != "threads") throw names::UsageError("-NSmode is poller or threads");
    return mode == "threads";
}

void start_trace(const std::string& modules, const std::string& file) {
    KELDebugLogger* const log = KELDebugLogger::instance();
    if (!file.empty()) {
        log->setLogFile(file.c_str());
        log->setFlag(1);  // the file is rotated
    }
    if (!names::enable_trace(modules)) throw names::UsageError("-NStrace names a module that is not known");
}

// As many clients as the system lets this process have.
void raise_descriptor_limit() {
    rlimit limit;
    if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
    limit.rlim_cur = limit.rlim_max;
    setrlimit(RLIMIT_NOFILE, &limit);
}

void serve(names::Options& options) {
    const std::string host = options.text("NShost", "127.0.0.1");
    const long port = options.number("NSport", 0, 0, 65535);
    const long range = options.number("NSrange", 0, 0, 65535);
    const bool threads = wants_threads(options.text("NSmode", "poller"));
    const KELPoll::SupportedAPIs api = api_called(options.text("NSapi", "poll"));
    const std::string journal_file = options.text("NSjournal", "");
    const std::string plugin = options.text("NSplugin", "nsjournal");
    const std::string trace = options.text("NStrace", "");
    const std::string trace_file = options.text("NStracefile", "");
    options.refuse_others();
    start_trace(trace, trace_file);
    raise_descriptor_limit();

    std::unique_ptr<names::Journal> journal;
    if (!journal_file.empty()) journal = names::load_journal(plugin.c_str(), journal_file.c_str());
    names::NameStore store;
    if (journal != nullptr) store.keep(*journal);
    names::Servant servant(store);

    const int listener = KELPortable::createTcpListenerSocket(host.c_str(), static_cast<unsigned short>(port),
                                                              static_cast<unsigned long>(range));
    const int bound_port = KELPortable::saGetPort(listener);
    std::unique_ptr<names::Server> server;
    if (threads) {
        server = std::make_unique<names::ThreadServer>(listener, api, servant);
    } else {
        server = std::make_unique<names::PollServer>(listener, api, servant);
    }
    running = server.get();
    std::signal(SIGINT, on_stop_signal);
    std::signal(SIGTERM, on_stop_signal);
    std::cout << "names_server: listening on " << host << " port " << bound_port << std::endl;
    server->run();
    std::signal(SIGINT, SIG_DFL);
    std::signal(SIGTERM, SIG_DFL);
    std::cout << "names_server: stopped after " << server->clients() << " clients and " << server->requests()
              << " requests" << std::endl;
}

}  // namespace

int main(int argc, char** argv) {
    try {
        names::Options options(argc, argv);
        if (argc > 1) {
            const bool help = std::strcmp(argv[1], "--help") == 0;
            (help ? std::cout : std::cerr) << kUsage;
            return help ? 0 : 1;
        }
        serve(options);
        return 0;
    } catch (const names::UsageError& mistake) {
        std::cerr << "names_server: " << mistake.what() << '\n' << kUsage;
    } catch (const CORBA_Exception& failure) {
        const CORBA_String_var why(kel_explain(failure));
        std::cerr << "names_server: cannot serve\n" << failure << why.in() << '\n';
    } catch (const std::exception& failure) {
        std::cerr << "names_server: " << failure.what() << '\n';
    }
    return 1;
}
