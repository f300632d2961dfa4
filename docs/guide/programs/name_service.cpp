// SPDX-License-Identifier: MIT
#include <kel/kel.h>
#include <unistd.h>

#include <iostream>
#include <sstream>
#include <string>

// What the service throws when it does not know a name. It travels like every exception.
class NotFound : public CORBA_UserException {
public:
    const Description* _desc() const override { return &_description; }
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new NotFound(*this); }
    static CORBA_Exception* _factory() { return new NotFound; }
    static Description _description;
};

CORBA_Exception::Description NotFound::_description("NotFound", "IDL:example.org/NotFound:1.0",
                                                    NotFound::_factory, &CORBA_UserException::_description,
                                                    0);

// A connected descriptor that is closed with its owner. A message is a text that ends with a zero byte.
class Connection {
public:
    explicit Connection(int fd) : _fd(fd) {}
    ~Connection() { close(_fd); }
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    void send(const std::string& message) {
        const std::size_t size = message.size() + 1;
        if (write(_fd, message.c_str(), size) != static_cast<ssize_t>(size))
            KELPortable::socketError(errno, 0);
    }

    // The next message; empty when the other side has closed or keeps silent for five seconds.
    std::string receive() {
        std::string message;
        for (char c = 0; next(c) && c != '\0';) message += c;
        return message;
    }

private:
    // A socket that was connected with a time-out stays non-blocking: the poller waits.
    bool next(char& c) {
        KELImplPoll poller(1);
        poller.add(_fd, KELPoll::evMaskRead, 0);
        return poller._waitForEvents(5000) == 1 && read(_fd, &c, 1) == 1;
    }

    int _fd;
};

// The names, and who answers requests about them.
class Names {
public:
    void bind(const char* name, const char* where) {
        KELWLock_var hold(_names.rwlock());
        _names.add(CORBA_String_var(name), CORBA_String_var(where));  // BAD_PARAM when it is bound
    }

    CORBA_String_var resolve(const char* name) {
        KELRLock_var hold(_names.rwlock());
        CORBA_String_var where;
        if (!_names.atKey(CORBA_String_var(name), where)) throw NotFound();
        return where;
    }

    // Decodes a request, carries it out and encodes the reply: a status, then a result or an exception.
    std::string answer(const std::string& request) {
        std::istringstream text(request);
        KEListream in(text);
        CORBA_String_var operation, name, where;
        in >> operation >> name >> where;

        std::ostringstream reply;
        KELostream out(reply);
        try {
            if (std::string(operation.in()) == "bind") {
                bind(name.in(), where.in());
            } else {
                where = resolve(name.in());
            }
            out << 0 << where.in();
        } catch (const CORBA_Exception& problem) {
            out << 1 << problem;
        }
        return reply.str();
    }

private:
    KELDictionary_r<CORBA_String_var, CORBA_String_var> _names;
};

// Serves one client after the other until one connects and says nothing.
class Server : public KELThread {
public:
    Server(Names& names, int listener, KELPipe& done)
        : KELThread(0), _names(names), _listener(listener), _done(done) {}

    void begin() override {
        for (bool served = true; served;) {
            Connection client(KELPortable::socketAccept(_listener));
            served = false;
            for (std::string request; !(request = client.receive()).empty(); served = true) {
                client.send(_names.answer(request));
            }
        }
        _done.write(".", 1);  // the last act: main may go now
    }

private:
    Names& _names;
    int _listener;
    KELPipe& _done;
};

// The client's side of a request: an exception of the server is thrown here, as if it had been local.
CORBA_String_var call(Connection& server, const char* operation, const char* name, const char* where) {
    std::ostringstream request;
    KELostream out(request);
    out << operation << name << where;
    server.send(request.str());

    std::istringstream reply(server.receive());
    KEListream in(reply);
    int failed = 0;
    in >> failed;
    if (failed != 0) {
        CORBA::Exception_var problem;
        in >> problem.out();
        problem->_raise();
    }
    CORBA_String_var result;
    in >> result;
    return result;
}

int main() {
    Names names;
    const int listener = KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0);
    const unsigned short port = static_cast<unsigned short>(KELPortable::saGetPort(listener));
    KELPipe done;
    Server service(names, listener, done);
    service.run();

    {
        Connection server(KELPortable::tcpConnect("127.0.0.1", port, 2000, ""));
        call(server, "bind", "vesta", "host-4:2809");
        std::cout << "vesta is at " << call(server, "resolve", "vesta", "") << "\n";
        try {
            call(server, "resolve", "juno", "");
        } catch (const NotFound&) {
            std::cout << "juno is not bound\n";
        }
        try {
            call(server, "bind", "vesta", "host-5:2809");
        } catch (const CORBA::BAD_PARAM&) {
            std::cout << "vesta is bound already\n";
        }
    }
    Connection(KELPortable::tcpConnect("127.0.0.1", port, 2000, ""));  // says nothing: the end
    char c = 0;
    done.read(&c, 1);
    close(listener);
}
