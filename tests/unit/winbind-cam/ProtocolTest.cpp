// SPDX-License-Identifier: Apache-2.0
#include <Protocol.h>

#include "../../../providers/winbind-cam/Codes.h"
#include "../../../providers/winbind/Failure.h"

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

namespace tessel::winbind::cam {
namespace {

using nlohmann::json;
using testing::HasSubstr;

/// The code of the failure that `call` ends with, 0 where it does not fail.
template <typename Call> Codes::Code CodeOf(Call call) {
    try {
        (void)call(); // what is looked at is how it fails
    } catch (Failure const& failure) {
        return failure.Code();
    }
    return 0;
}

Codes::Code DomainCode(std::string const& answer) {
    return CodeOf([&] { return ReadDomainAnswer(answer); });
}

Codes::Code AccountCode(std::string const& answer) {
    return CodeOf([&] { return ReadAccountAnswer(answer).controller; });
}

char const GoodDomain[] = R"({"netbios": "CORP", "dns": "corp.example", "sid": "S-1-5-21-1-2-3"})";

char const GoodAccount[] =
    R"({"controller": "dc1.corp.example", "blob": "Ab+/0=", "claim": "0a-1"})";

/// `text` with another value for `key`.
std::string With(char const* text, char const* key, json const& value) {
    json answer = json::parse(text);
    answer[key] = value;
    return answer.dump();
}

json Request(std::string const& host, char const* unit) {
    return json::parse(View(AccountRequest(host, unit, "AB-12", "k3y")));
}

TEST(ProtocolTest, ARequestIsOneObjectOfJSON) {
    EXPECT_EQ(json({{"host", "host-01"},
                    {"unit", "Servers/\"Linux\"\n"},
                    {"code", "AB-12"},
                    {"host_key", "k3y"}}),
              Request("host-01", "Servers/\"Linux\"\n"));
    EXPECT_EQ(json({{"claim", "0a-1"}}), json::parse(View(ReceivedRequest("0a-1"))));
}

TEST(ProtocolTest, AHostThatLeavesTheUnitToTheServiceNamesNone) {
    EXPECT_FALSE(Request("host01", nullptr).contains("unit"));
}

TEST(ProtocolTest, ANameThatNoHostHasIsNotAskedFor) {
    auto const code = [](char const* name) {
        return CodeOf([&] {
            RequireHostName(name);
            return 0;
        });
    };
    for (char const* name :
         {"", "a.b", "a b", "-a", "a-", "a\n", "host$", "h\xc3\xb6st", "a/b", "a234567890123456"}) {
        EXPECT_EQ(Codes::InvalidComputerName, code(name)) << name;
    }
    EXPECT_EQ(0U, code("a23456789012345"));
}

TEST(ProtocolTest, AUnitThatIsNoTextIsRefused) {
    EXPECT_EQ(Codes::InvalidParameter, CodeOf([] { return Request("a", "\xff"); }));
}

TEST(ProtocolTest, AHostsKeyIsItsOwnAndTheCodes) {
    std::string const key = HostKey("machine", "CODE");
    EXPECT_EQ(key, HostKey("machine", "CODE"));
    EXPECT_NE(key, HostKey("machinE", "CODE"));
    EXPECT_NE(key, HostKey("machine", "CODF"));
    EXPECT_NE(key, HostKey("machineC", "ODE"));
    EXPECT_EQ(64U, key.size());
    EXPECT_EQ(std::string::npos, key.find_first_not_of("0123456789abcdef"));
}

TEST(ProtocolTest, ADomainsAnswerIsRead) {
    DomainInformation const information = ReadDomainAnswer(GoodDomain);
    EXPECT_EQ("CORP", information.netBIOSName);
    EXPECT_EQ("corp.example", information.dnsName);
    EXPECT_EQ("S-1-5-21-1-2-3", information.sid);
}

TEST(ProtocolTest, NonsenseIsNoAnswer) {
    for (char const* text :
         {"", "\n", "x", "{}", "[]", "null", "{\"netbios\": \"CORP\"", "[[[[[[[[", "\xff\xfe",
          "{\"error\": 3}", "{\"error\": \"other\"}", "{}{}", "<html></html>"}) {
        EXPECT_EQ(Codes::InvalidAnswer, DomainCode(text)) << text;
        EXPECT_EQ(Codes::InvalidAnswer, AccountCode(text)) << text;
    }
}

TEST(ProtocolTest, ANameThatIsNoneIsNotHandedOn) {
    EXPECT_EQ(0U, DomainCode(With(GoodDomain, "dns", "a-b.example")));
    for (char const* key : {"netbios", "dns", "sid"}) {
        for (json const& value : {json(), json(1), json(""), json("a b"), json("a\nb"),
                                  json(std::string("a\0b", 3)), json(std::string(300, 'a'))}) {
            EXPECT_EQ(Codes::InvalidAnswer, DomainCode(With(GoodDomain, key, value)))
                << key << " " << value;
        }
    }
    EXPECT_EQ(Codes::InvalidAnswer, DomainCode(With(GoodDomain, "sid", "X-1-5")));
}

TEST(ProtocolTest, AnAccountsAnswerIsRead) {
    MachineAccount const account = ReadAccountAnswer(GoodAccount);
    EXPECT_EQ("dc1.corp.example", account.controller);
    EXPECT_EQ("Ab+/0=", View(account.blob));
    EXPECT_EQ("0a-1", account.claim);
}

TEST(ProtocolTest, AnAccountThatLacksSomethingIsNoAnswer) {
    for (json const& value : {json(), json(1), json(""), json("A b"), json("A\rb"), json("\""),
                              json("A\n"), json(std::string(70000, '.'))}) {
        for (char const* key : {"blob", "controller", "claim"}) {
            EXPECT_EQ(Codes::InvalidAnswer, AccountCode(With(GoodAccount, key, value)))
                << key << value;
        }
    }
}

TEST(ProtocolTest, EachRefusalHasItsCode) {
    struct {
        char const* error;
        Codes::Code code;
    } const refusals[] = {
        {"code-refused", 5},  {"too-many-attempts", 1909}, {"account-exists", 1316},
        {"no-such-unit", 87}, {"bad-request", 87},         {"failed", 1359},
        {"busy", 1359},
    };
    for (auto const& refusal : refusals) {
        std::string const answer = json({{"error", refusal.error}}).dump();
        EXPECT_EQ(refusal.code, AccountCode(answer));
        EXPECT_EQ(refusal.code, DomainCode(answer));
    }
}

TEST(ProtocolTest, AFailureDoesNotTellTheBlob) {
    for (char const* answer :
         {R"({"controller": "a b", "blob": "SECRET", "claim": "1"})",
          R"({"controller": "a", "blob": "SECRET!", "claim": "1"})", R"({"blob": "SECRET)"}) {
        try {
            (void)ReadAccountAnswer(answer);
            ADD_FAILURE() << answer;
        } catch (Failure const& failure) {
            EXPECT_THAT(failure.what(), Not(HasSubstr("SECRET")));
        }
    }
}

} // namespace
} // namespace tessel::winbind::cam
