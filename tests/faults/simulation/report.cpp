// Printing tasks and stories.
//
// SPDX-License-Identifier: MIT
#include <cstdio>
#include <iomanip>
#include <iostream>
#include <string>

#include "tests/faults/simulation/story.h"

namespace kel {
namespace sim {

namespace {

const int column = 76;

template <class... A>
std::string text(const char* format, A... a) {
    char buffer[400];
    std::snprintf(buffer, sizeof buffer, format, a...);
    return buffer;
}

std::string text_of(const Address& address) {
    if (address.size == 0) return "";
    std::string bytes;
    for (unsigned i = 0; i < address.ip_size(); ++i) bytes += text("%02x", address.ip()[i]);
    return text(" %d/%s:%u", address.family(), bytes.c_str(), address.port()) +
           (address.family() == v6_family ? text("%%%u", address.scope()) : "") +
           (address.size == 16 || address.size == 28 ? "" : text(" (%u bytes)", address.size));
}

std::string text_of(const Event& event) {
    static const char* const calls[] = {
        "getaddrinfo",     "getaddrinfo of one family",
        "gethostbyname_r", "if_nametoindex",
        "socket",          "setsockopt",
        "fcntl F_SETFL",   "bind",
        "listen",          "accept",
        "connect",         "wait",
        "getsockopt",      "getsockname",
        "sleep",           "pause",
        "close",
    };
    std::string line = text("%12llu ms  %s", static_cast<unsigned long long>(event.time),
                            calls[static_cast<unsigned>(event.call)]);
    line += text("(%lld", static_cast<long long>(event.a));
    if (event.b != 0) line += text(", %lld", static_cast<long long>(event.b));
    line += text_of(event.address) + text(") = %lld", static_cast<long long>(event.result));
    if (event.error != 0) line += text(", errno %d", event.error);
    return line;
}

std::vector<std::string> lines_of(const Ending& ending) {
    return {
        text("ends with %s, minor 0x%x, completed %u", name_of(ending.thrown), ending.minor,
             ending.completed),
        text("reason \"%.300s\"", ending.reason),
        text("descriptor %d%s, error %d", ending.descriptor, ending.nonblocking ? " non-blocking" : "",
             ending.error),
        text("%d descriptors open, %d lists open, %d own lists released, %d blocks kept", ending.open,
             ending.lists, ending.own_lists, ending.blocks),
        text("%llu ms", static_cast<unsigned long long>(ending.time)),
    };
}

std::vector<std::string> lines_of(const Story& story) {
    std::vector<std::string> lines;
    for (const Event& event : story.events) lines.push_back(text_of(event));
    for (const std::string& line : lines_of(story.ending)) lines.push_back(line);
    return lines;
}

std::string quoted(const Task& task, unsigned name) {
    const char* const text = name_of(*task.machine, name).text;
    return text == nullptr ? "null" : '"' + std::string(text) + '"';
}

}  // namespace

void print(std::ostream& out, const Task& task) {
    switch (task.job) {
        case Job::connect_host:
            out << "tcpConnect(" << quoted(task, task.host) << ", " << task.port << ", " << task.timeout
                << ", " << quoted(task, task.bind_host) << ")";
            break;
        case Job::connect_socket:
            out << "tcpConnect(fd, err," << text_of(task.peer) << ", " << task.timeout << ")";
            break;
        case Job::listen_on:
            out << "createTcpListenerSocket(" << quoted(task, task.host) << ", " << task.port << ", "
                << task.range << ")";
            break;
        case Job::accept_one:
            out << "socketAccept(fd)";
            break;
        case Job::bind_name:
            out << "KELSetBindName(fd, " << quoted(task, task.bind_host) << ", " << task.family << ")";
            break;
    }
    out << " with " << (task.selecting ? "select" : "poll") << " on the machine \"" << task.machine->name.text
        << "\"\n";
}

void print_side_by_side(std::ostream& out, const Task& task, const Story& acted, const Story& foretold) {
    const std::vector<std::string> left = lines_of(acted);
    const std::vector<std::string> right = lines_of(foretold);
    out << "  " << std::left << std::setw(column) << "what happened"
        << "what should happen, seed " << task.seed << '\n';
    for (std::size_t i = 0; i < left.size() || i < right.size(); ++i) {
        const std::string mine = i < left.size() ? left[i] : "";
        const std::string other = i < right.size() ? right[i] : "";
        out << (mine == other ? "  " : "! ") << std::left << std::setw(column) << mine << other << '\n';
    }
}

}  // namespace sim
}  // namespace kel
