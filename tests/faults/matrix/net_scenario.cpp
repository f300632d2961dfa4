// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/net_scenario.h"

#include <kel/containers/strings.h>
#include <kel/os/portable.h>

#include <cstring>

#include "tests/os/fake_resolver.h"

namespace kel {
namespace test {

void know_this_machine() {
    reset_faults();
    name_machine("kelhost");
    const FakeResolver resolver({}, "192.0.2.7");
    FakeAddressInfo addresses;
    addresses.knows("kelhost", AF_INET, "192.0.2.7");
    addresses.knows("kelhost", AF_INET6, "2001:db8::7");
    {
        const Armed armed;
        CORBA::string_free(KELPortable::ip_addr(nullptr));
        CORBA::string_free(KELPortable::ipAddr(AF_INET, nullptr));
        CORBA::string_free(KELPortable::ipAddr(AF_INET6, nullptr));
    }
    reset_faults();
}

void NetScenario::prepare() {
    net.install();
    net.resolve("one", {"10.1.1.1"});
    net.resolve("two", {"10.1.1.1", "10.1.1.2"});
    net.resolve("six", {"2001:db8::9"});
    net.resolve("both", {"10.1.1.3", "2001:db8::3"});
    net.resolve("link", {"fe80::1"});
    set_up();
}

int NetScenario::open_socket() { return _own = net.open_socket(); }

std::string NetScenario::left_over() {
    for (int* fd : {&_kept, &_own}) {
        if (*fd >= 0) net.forget(*fd);
        *fd = -1;
    }
    std::string left;
    if (net.open_count() != 0) left += std::to_string(net.open_count()) + " descriptors ";
    if (net.live_lists() != 0) left += std::to_string(net.live_lists()) + " lists";
    return left;
}

}  // namespace test
}  // namespace kel
