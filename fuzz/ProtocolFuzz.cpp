// SPDX-License-Identifier: Apache-2.0
/// Reads any bytes as a CAM service's answer. What is taken for one survives being written and read
/// again, and is fit to be printed; all else ends in a failure with a code of the table.
#include "../providers/winbind-cam/Codes.h"
#include "../providers/winbind-cam/Protocol.h"
#include "../providers/winbind/Failure.h"
#include "Expect.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <nlohmann/json.hpp>

using namespace tessel::winbind;
using namespace tessel::winbind::cam;

namespace {

bool IsOfTheTable(Codes::Code code) {
    for (Codes::Code const known :
         {Codes::CodeRefused, Codes::InvalidAnswer, Codes::InvalidParameter, Codes::AccountExists,
          Codes::ServiceFailed, Codes::TooManyAttempts}) {
        if (code == known) {
            return true;
        }
    }
    return false;
}

void ExpectPrintable(std::string_view text) {
    bool const isPrintable = !text.empty() && std::all_of(text.begin(), text.end(), [](char c) {
        return c > ' ' && c < '\x7f';
    });
    Expect("a name may be printed", isPrintable ? "yes" : std::string(text), "yes");
}

template <typename Read> void Try(Read read) {
    try {
        read();
    } catch (Failure const& failure) {
        Expect("the code is one of the table", std::to_string(IsOfTheTable(failure.Code())), "1");
    }
}

void TryDomain(std::string_view answer) {
    Try([&] {
        DomainInformation const information = ReadDomainAnswer(answer);
        std::string const again = nlohmann::json({{"netbios", information.netBIOSName},
                                                  {"dns", information.dnsName},
                                                  {"sid", information.sid}})
                                      .dump();
        DomainInformation const second = ReadDomainAnswer(again);
        Expect("the NetBIOS name is kept", second.netBIOSName, information.netBIOSName);
        Expect("the DNS name is kept", second.dnsName, information.dnsName);
        Expect("the identifier is kept", second.sid, information.sid);
        ExpectPrintable(information.netBIOSName);
        ExpectPrintable(information.dnsName);
        ExpectPrintable(information.sid);
    });
}

void TryAccount(std::string_view answer) {
    Try([&] {
        MachineAccount const account = ReadAccountAnswer(answer);
        ExpectPrintable(View(account.blob));
        ExpectPrintable(account.controller);
        ExpectPrintable(account.claim);
        std::string const again = nlohmann::json({{"controller", account.controller},
                                                  {"blob", std::string(View(account.blob))},
                                                  {"claim", account.claim}})
                                      .dump();
        MachineAccount const second = ReadAccountAnswer(again);
        Expect("the blob is kept", std::string(View(second.blob)), std::string(View(account.blob)));
        Expect("the controller is kept", second.controller, account.controller);
        Expect("the claim is kept", second.claim, account.claim);
    });
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    std::string_view const answer(reinterpret_cast<char const*>(data), size);
    TryDomain(answer);
    TryAccount(answer);
    return 0;
}
