// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/exceptions/explain.h>
#include <kel/exceptions/standard.h>
#include <kel/os/address.h>
#include <kel/os/portable.h>
#include <kel/os/socket.h>
#include <unistd.h>

#include <iostream>

unsigned short port_of(int fd) { return static_cast<unsigned short>(KELPortable::saGetPort(fd)); }

int main() {
    // Port 0 lets the system choose one; "127.0.0.1" listens on the loopback only.
    const int listener = KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0);
    const unsigned short port = port_of(listener);

    // Within two seconds, and the system chooses the local address.
    const int client = KELPortable::tcpConnect("127.0.0.1", port, 2000, "");
    const int server = KELPortable::socketAccept(listener);

    unsigned short unchanged = 0;
    const CORBA_String_var peer(KELPortable::peer_addr(server, unchanged));
    std::cout << "connected from " << peer << "\n";

    if (write(client, "hello", 5) != 5) return 1;
    char text[6] = {};
    if (read(server, text, 5) != 5) return 1;
    std::cout << text << "\n";
    close(client);
    close(server);
    close(listener);

    // Nobody listens there any more.
    try {
        KELPortable::tcpConnect("127.0.0.1", port, 0, "");
    } catch (const CORBA::TRANSIENT& refused) {
        const CORBA::String_var why(kel_explain(refused));  // the host and the port are not in it
        std::cout << "127.0.0.1, the port from before: " << why << "\n";
    }

    // A bind name that is no address of this machine's.
    try {
        int fd = socket(AF_INET, SOCK_STREAM, 0);
        try {
            KELSetBindName(fd, "192.0.2.1", AF_INET);
        } catch (...) {
            close(fd);  // it stays open: whoever made it closes it
            throw;
        }
    } catch (const CORBA::BAD_PARAM& wrong) {
        std::cout << wrong.reason() << "\n";
    }

    // Every address of a host, as one list.
    addrinfo* const all = Getaddrinfo("", port, SOCK_STREAM, 1);
    for (addrinfo* node = all; node != 0; node = node->ai_next) {
        std::cout << (node->ai_family == AF_INET6 ? "any IPv6 address" : "any IPv4 address") << "\n";
    }
    Freeaddrinfo(all);
}
