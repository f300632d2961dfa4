// SPDX-License-Identifier: MIT
#include "tests/examples/names_process.h"

#include <arpa/inet.h>
#include <dirent.h>
#include <netinet/in.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <functional>
#include <stdexcept>

namespace kel {
namespace test {

namespace {

const int kPatience = 10000;  // milliseconds; a loaded machine is slow

sockaddr_in loopback(int port) {
    sockaddr_in address = {};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<unsigned short>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

int bound_socket() {
    const int fd = ::socket(AF_INET, SOCK_STREAM, 0);
    const sockaddr_in address = loopback(0);
    if (::bind(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        throw std::runtime_error("bind");
    }
    return fd;
}

bool becomes_true(const std::function<bool()>& condition) {
    for (int waited = 0; waited < kPatience && !condition(); waited += 10) ::poll(nullptr, 0, 10);
    return condition();
}

int port_of(int fd) {
    sockaddr_in address = {};
    socklen_t size = sizeof address;
    ::getsockname(fd, reinterpret_cast<sockaddr*>(&address), &size);
    return ntohs(address.sin_port);
}

// The next bytes of `fd`; empty at its end or when nothing comes.
std::string next_bytes(int fd, std::size_t n) {
    pollfd entry = {fd, POLLIN, 0};
    if (::poll(&entry, 1, kPatience) <= 0) return "";
    std::string bytes(n, '\0');
    const ssize_t got = ::read(fd, &bytes[0], n);
    bytes.resize(got > 0 ? static_cast<std::size_t>(got) : 0);
    return bytes;
}

std::vector<std::string> with(std::vector<std::string> program, const std::vector<std::string>& options) {
    program.insert(program.end(), options.begin(), options.end());
    return program;
}

// The thread sanitizer keeps a signal back while the server waits in select, up to the next call of
// another kind: one that a visitor brings about.
void let_signal_through([[maybe_unused]] int port) {
#if defined(__SANITIZE_THREAD__)
    try {
        RawClient visitor(port);
    } catch (const std::runtime_error&) {
        // The signal came through before.
    }
#endif
}

}  // namespace

NamesServer::NamesServer(const std::vector<std::string>& options) : _port(0) {
    int ends[2];
    if (::pipe(ends) != 0) throw std::runtime_error("pipe");
    _process = ::fork();
    if (_process == 0) {
        ::dup2(ends[1], 1);
        ::close(ends[0]);
        ::close(ends[1]);
        std::vector<std::string> program = with({NAMES_SERVER}, options);
        std::vector<char*> arguments;
        for (std::string& argument : program) arguments.push_back(&argument[0]);
        arguments.push_back(nullptr);
        ::execv(NAMES_SERVER, arguments.data());
        ::_exit(127);
    }
    ::close(ends[1]);
    _output = ends[0];
    std::string said;
    while (said.find('\n') == std::string::npos) {
        const std::string more = next_bytes(_output, 256);
        if (more.empty()) throw std::runtime_error("the server says nothing");
        said += more;
    }
    std::sscanf(said.c_str(), "names_server: listening on %*s port %d", &_port);
}

NamesServer::~NamesServer() {
    if (_process > 0) stop();
    ::close(_output);
}

int NamesServer::stop() {
    ::kill(_process, SIGTERM);
    let_signal_through(_port);
    return end();
}

void NamesServer::crash() {
    ::kill(_process, SIGKILL);
    end();
}

int NamesServer::end() {
    int status = 0;
    ::waitpid(_process, &status, 0);
    _process = 0;
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

int NamesServer::descriptors() const { return entries_of("fd"); }

int NamesServer::threads() const { return entries_of("task"); }

int NamesServer::entries_of(const char* what) const {
    DIR* const folder = ::opendir(("/proc/" + std::to_string(_process) + "/" + what).c_str());
    int n = -2;  // the entries "." and ".."
    while (::readdir(folder) != nullptr) ++n;
    ::closedir(folder);
    return n;
}

bool NamesServer::settles_at(int descriptors_expected) const {
    return becomes_true([&] { return descriptors() == descriptors_expected; });
}

bool NamesServer::settles_at(int descriptors_expected, int threads_expected) const {
    return settles_at(descriptors_expected) && becomes_true([&] { return threads() == threads_expected; });
}

Outcome NamesServer::client(const std::string& lines, const std::vector<std::string>& options) const {
    return names_client(_port, lines, options);
}

std::vector<std::string> NamesServer::outcomes(const std::string& lines) const {
    const std::string arrow = "       -> ";
    const std::string out = client(lines).out;
    std::vector<std::string> found;
    for (std::size_t at = out.find(arrow); at != std::string::npos; at = out.find(arrow, at)) {
        at += arrow.size();
        found.push_back(out.substr(at, out.find('\n', at) - at));
    }
    return found;
}

RawClient::RawClient(int port) : _fd(::socket(AF_INET, SOCK_STREAM, 0)) {
    const sockaddr_in address = loopback(port);
    if (::connect(_fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        throw std::runtime_error("connect");
    }
}

RawClient::~RawClient() { ::close(_fd); }

void RawClient::send(const std::string& bytes) {
    std::size_t sent = 0;
    while (sent < bytes.size()) {
        const ssize_t n = ::send(_fd, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
        if (n <= 0) return;
        sent += static_cast<std::size_t>(n);
    }
}

std::string RawClient::receive_all() { return receive(static_cast<std::size_t>(-1)); }

std::string RawClient::receive(std::size_t n) {
    while (_received.size() < n) {
        const std::string more = next_bytes(_fd, 64 * 1024);
        if (more.empty()) break;
        _received += more;
    }
    const std::string taken = _received.substr(0, n);
    _received.erase(0, n);
    return taken;
}

std::string RawClient::receive_message() {
    const std::string header = receive(9);
    return header.size() == 9 ? receive(std::stoul(header, nullptr, 16)) : std::string();
}

void RawClient::reset() {
    const linger at_once = {1, 0};
    ::setsockopt(_fd, SOL_SOCKET, SO_LINGER, &at_once, sizeof at_once);
    ::close(_fd);
    _fd = -1;
}

SilentPort::SilentPort() : _fd(bound_socket()), _port(port_of(_fd)) { ::listen(_fd, 16); }

SilentPort::~SilentPort() { ::close(_fd); }

int unused_port() {
    const int fd = bound_socket();
    const int port = port_of(fd);
    ::close(fd);
    return port;
}

Outcome names_client(int port, const std::string& lines, const std::vector<std::string>& options) {
    return run_program(with({NAMES_CLIENT, "-NSport", std::to_string(port)}, options), {}, lines);
}

std::string frame(const std::string& text) {
    char header[16];
    std::snprintf(header, sizeof header, "%08zx\n", text.size());
    return header + text;
}

}  // namespace test
}  // namespace kel
