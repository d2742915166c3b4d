// SPDX-License-Identifier: Apache-2.0
// What a service sees that asks a provider for the trusted domains: before the provider hangs, and
// while it does. The demo compiles and runs this beside the provider "directed". It fails where an
// answer is not the first one again, or comes later than the store's timeout allows.
#include <tslauth/ActiveDirectoryStore.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <fstream>
#include <string>

namespace {

using Seconds = std::chrono::duration<double>;

constexpr int Timeout = 1;

/// @param most how long the answer may take
void Show(tessel::authentication::ActiveDirectoryStore const& store, char const* when,
          double most) {
    auto const begin = std::chrono::steady_clock::now();
    auto const domains = store.GetTrustedDomains();
    double const took = Seconds(std::chrono::steady_clock::now() - begin).count();
    auto const name = domains.empty() ? std::string("(nothing)") : domains.front().DNSName();
    std::printf("%-34s %s, after %.1f s\n", when, name.c_str(), took);
    if (name != "other.test" || took > most) {
        std::printf("expected: other.test, after at most %.1f s\n", most);
        std::exit(1);
    }
}

void Direct(char const* order) {
    std::ofstream("/run/directed/new") << order;
    // As a whole, since the provider may read it at any time.
    if (std::rename("/run/directed/new", "/run/directed/trusted") != 0) {
        std::perror("/run/directed/trusted");
        std::exit(1);
    }
}

} // namespace

int main() {
    tessel::authentication::ActiveDirectoryStore const store(Timeout);
    Direct("other.test");
    Show(store, "the provider answers:", 0.5);
    Direct("hang");
    Show(store, "it hangs, the timeout is 1 s:", Timeout + 0.5);
    Show(store, "it still hangs, and is not asked:", 0.5);
    std::fflush(stdout);
    std::_Exit(0); // one call is still inside the provider
}
