// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Domain.h>

#include <gtest/gtest.h>

#include <iomanip>
#include <sstream>

using tessel::authentication::Domain;

namespace {

std::string Printed(Domain const& domain) {
    std::ostringstream stream;
    stream << domain;
    return stream.str();
}

} // namespace

TEST(DomainTest, ADefaultDomainHasTwoEmptyNames) {
    EXPECT_EQ("", Domain().DNSName());
    EXPECT_EQ("", Domain().NetBIOSName());
}

TEST(DomainTest, ItsNamesAreGivenInTheOrderDNSNetBIOS) {
    Domain const domain("corp.example", "CORP");
    EXPECT_EQ("corp.example", domain.DNSName());
    EXPECT_EQ("CORP", domain.NetBIOSName());
}

TEST(DomainTest, ACopyHasTheSameNames) {
    Domain const domain("corp.example", "CORP");
    Domain copy(domain);
    EXPECT_EQ(domain, copy);
    copy = Domain();
    EXPECT_EQ(Domain(), copy);
    copy = domain;
    EXPECT_EQ(domain, copy);
}

TEST(DomainTest, DomainsAreEqualWhenBothNamesAre) {
    EXPECT_TRUE(Domain("a", "b") == Domain("a", "b"));
    EXPECT_FALSE(Domain("a", "b") == Domain("a", "c"));
    EXPECT_FALSE(Domain("a", "b") == Domain("c", "b"));
    EXPECT_FALSE(Domain("a", "b") == Domain("A", "b"));
    EXPECT_TRUE(Domain("a", "b") != Domain("b", "a"));
    EXPECT_FALSE(Domain("a", "b") != Domain("a", "b"));
}

TEST(DomainTest, PrintsBothNamesWithoutALineEnd) {
    EXPECT_EQ("DNS Name: corp.example, NetBIOS Name: CORP",
              Printed(Domain("corp.example", "CORP")));
}

TEST(DomainTest, PrintsUnsetForAnEmptyName) {
    EXPECT_EQ("DNS Name: (unset), NetBIOS Name: (unset)", Printed(Domain()));
    EXPECT_EQ("DNS Name: corp.example, NetBIOS Name: (unset)", Printed(Domain("corp.example", "")));
    EXPECT_EQ("DNS Name: (unset), NetBIOS Name: CORP", Printed(Domain("", "CORP")));
}

TEST(DomainTest, PrintsAllBytesOfAName) {
    std::string const name("a\0b", 3);
    EXPECT_EQ("DNS Name: " + name + ", NetBIOS Name: (unset)", Printed(Domain(name, "")));
}
