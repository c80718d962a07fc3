// The parser of state sections: what it accepts, what it refuses, and that nothing it is
// given can crash it.
#include <gtest/gtest.h>

#include <string>

#include "core/json_io.h"
#include "generate.h"
#include "hostctl/session.h"

namespace {

using TknCtl::Json::In;
using TknCtl::Json::Parse;
using TknCtl::Json::Value;

std::string Refusal(const std::string& text) {
    try {
        Parse(text, "s");
    } catch (const TknCtl::Lib::SectionFault& e) {
        return e.what();
    }
    return "accepted";
}

TEST(StateParse, StringsDecodeEscapesAndKeepUtf8) {
    const auto document = Parse(R"(["a\"\\\/\b\f\n\r\t", "\u00e9\u20ac\ud83d\ude00", "é€😀", ""])", "s");
    const Value& v = document.Root();
    ASSERT_TRUE(v.is_array());
    ASSERT_EQ(v.size(), 4u);
    EXPECT_EQ(v.Items()[0].String(), "a\"\\/\b\f\n\r\t");
    EXPECT_EQ(v.Items()[1].String(), "\xc3\xa9\xe2\x82\xac\xf0\x9f\x98\x80");
    EXPECT_EQ(v.Items()[2].String(), v.Items()[1].String());
    EXPECT_EQ(v.Items()[3].String(), "");
}

TEST(StateParse, LongStringsDecodeWhereverTheirEscapesFall) {
    // Plain runs are taken 16 bytes at a time: an escape, a multi-byte character or the end
    // may fall anywhere in them.
    for (std::size_t pad = 0; pad < 40; ++pad) {
        const std::string plain(pad, 'x');
        const std::string text = "[\"" + plain + "\", \"" + plain + "\\n" + plain + "\", \"" + plain +
                                 "\xc3\xa9" + plain + "\", \"" + plain + "\\u0041\"]";
        const auto document = Parse(text, "s");
        const auto items = document.Root().Items();
        ASSERT_EQ(items.size(), 4u);
        EXPECT_EQ(items[0].String(), plain);
        EXPECT_EQ(items[1].String(), plain + "\n" + plain);
        EXPECT_EQ(items[2].String(), plain + "\xc3\xa9" + plain);
        EXPECT_EQ(items[3].String(), plain + "A");
        EXPECT_NE(Refusal("[\"" + plain + "\x01" + plain + "\"]").find("control character in a string"),
                  std::string::npos);
        EXPECT_NE(Refusal("[\"" + plain + "\xff" + plain + "\"]").find("not valid UTF-8"), std::string::npos);
        EXPECT_NE(Refusal("[\"" + plain).find("not closed"), std::string::npos);
    }
}

TEST(StateParse, RefusesWhatIsNotStrictJson) {
    for (const char* bad : {"",
                            "[1,]",
                            "{\"a\":1,}",
                            "[1] x",
                            "[01]",
                            "[1.]",
                            "[1e]",
                            "[-]",
                            "[+1]",
                            "[tru]",
                            "[\"open]",
                            "[\"\\x\"]",
                            "[\"\\ud800\"]",
                            "[\"\\udc00\"]",
                            "[\"\\ud800\\u0041\"]",
                            "[\"\\u12g4\"]",
                            "{1:2}",
                            "{\"a\" 1}",
                            "[1 2]",
                            "[nul]",
                            "'a'"}) {
        EXPECT_NE(Refusal(bad).find("s: not valid JSON: syntax error at byte "), std::string::npos) << bad;
    }
    // Raw control characters and bytes that are not UTF-8 (stray, overlong, surrogates,
    // beyond U+10FFFF, cut short).
    for (std::string bad :
         {std::string("[\"a\tb\"]"), std::string("[\"\x80\"]"), std::string("[\"\xc0\x80\"]"),
          std::string("[\"\xe0\x80\x80\"]"), std::string("[\"\xed\xa0\x80\"]"),
          std::string("[\"\xf4\x90\x80\x80\"]"), std::string("[\"\xe2\x82\"]")}) {
        EXPECT_NE(Refusal(bad).find("not valid JSON"), std::string::npos) << bad;
    }
    // Deep nesting is refused, not followed down the stack.
    EXPECT_EQ(Refusal(std::string(400, '[') + std::string(400, ']')), "accepted");
    EXPECT_NE(Refusal(std::string(100000, '[')).find("nested too deeply"), std::string::npos);
}

TEST(StateParse, NumbersKeepTheirKind) {
    const auto numbers =
        Parse("[18446744073709551615, -9223372036854775808, -0, 18446744073709551616, 1.5, 2e3]", "s");
    const auto n = numbers.Root().Items();
    EXPECT_TRUE(n[0].is_number_unsigned());
    EXPECT_EQ(n[0].Unsigned(), 18446744073709551615ull);
    EXPECT_TRUE(n[1].is_number_integer());
    EXPECT_FALSE(n[1].is_number_unsigned());
    EXPECT_EQ(n[1].Integer(), INT64_MIN);
    EXPECT_TRUE(n[2].is_number_integer());
    EXPECT_EQ(n[2].Integer(), 0);
    for (int i : {3, 4, 5})
        EXPECT_FALSE(n[static_cast<std::size_t>(i)].is_number_integer()) << i;
    EXPECT_DOUBLE_EQ(n[5].Double(), 2000);
    // Around the length where digits are taken as they go by.
    const auto edges = Parse(
        "[999999999999999999, 1000000000000000000, -999999999999999999, -1000000000000000000, "
        "9223372036854775807, -9223372036854775809]",
        "s");
    const auto e = edges.Root().Items();
    EXPECT_EQ(e[0].Unsigned(), 999999999999999999ull);
    EXPECT_EQ(e[1].Unsigned(), 1000000000000000000ull);
    EXPECT_EQ(e[2].Integer(), -999999999999999999ll);
    EXPECT_EQ(e[3].Integer(), -1000000000000000000ll);
    EXPECT_EQ(e[4].Unsigned(), 9223372036854775807ull);
    EXPECT_FALSE(e[5].is_number_integer());
    // Read as integers of a given width.
    const auto doc =
        Parse(R"({"small": 7, "negative": -1, "float": 2e3, "huge": 18446744073709551616})", "s");
    In in(doc.Root(), "s");
    EXPECT_EQ(in.Int<std::uint8_t>("small"), 7);
    EXPECT_EQ(in.Int<std::int32_t>("negative"), -1);
    auto refused = [&](auto read) {
        try {
            read();
        } catch (const TknCtl::Lib::SectionFault& e) {
            return std::string(e.what());
        }
        return std::string("read");
    };
    EXPECT_EQ(refused([&] { in.Int<std::uint32_t>("negative"); }),
              "s.negative: expected an integer from 0 to 4294967295");
    EXPECT_EQ(refused([&] { in.Int<std::uint32_t>("float"); }), "s.float: expected an integer");
    EXPECT_EQ(refused([&] { in.Int<std::uint64_t>("huge"); }), "s.huge: expected an integer");
}

TEST(StateParse, MembersMayBeReadInAnyOrder) {
    const auto doc = Parse(R"({"a": 1, "b": "two", "c": true, "d": 4})", "s");
    In in(doc.Root(), "s");
    EXPECT_EQ(in.Int<int>("d"), 4);
    EXPECT_EQ(in.Str("b"), "two");
    EXPECT_EQ(in.Int<int>("a"), 1);
    EXPECT_EQ(in.Int<int>("a"), 1);  // read again: still one member
    EXPECT_FALSE(in.Has("e"));
    try {
        in.Done();
        FAIL() << "a member never read was accepted";
    } catch (const TknCtl::Lib::SectionFault& e) {
        EXPECT_STREQ(e.what(), "s: unknown member 'c'");
    }
    EXPECT_TRUE(in.Bool("c"));
    EXPECT_NO_THROW(in.Done());
}

TEST(StateParse, MembersAreReadOnceAndNeverTwice) {
    const auto doc = Parse(R"({"name": "a", "extra": 1})", "s");
    In in(doc.Root(), "s");
    EXPECT_EQ(in.Str("name"), "a");
    EXPECT_THROW(in.Done(), TknCtl::Lib::SectionFault);
    const auto twice = Parse(R"({"name": "a", "name": "b"})", "s");
    In second(twice.Root(), "s");
    second.Str("name");
    try {
        second.Done();
        FAIL() << "a member given twice was accepted";
    } catch (const TknCtl::Lib::SectionFault& e) {
        EXPECT_STREQ(e.what(), "s: member 'name' appears twice");
    }
}

TEST(StateWrite, DumpWritesWhatTheLibraryWould) {
    using TknCtl::Json::Dump;
    using TknCtl::Json::Node;
    auto library = [](const Node& node) { return node.dump(-1, ' ', false, Node::error_handler_t::replace); };
    // Every section of the default host and of a generated one, as the state holds them.
    for (const std::string& text :
         {HostCtl::Lib::HostSession::InMemoryDefault()->Export(), Hadro::Sim::GenerateHost(0.05)}) {
        const Node document = Node::parse(text);
        for (const auto& [name, section] : document.items())
            EXPECT_EQ(Dump(section), library(section)) << name;
        EXPECT_EQ(Dump(document), library(document));
    }
    // Text that must be escaped, text that is not UTF-8, numbers of every kind, empty and
    // nested containers.
    Node odd = Node::object();
    odd["escapes"] = std::string("q\"b\\s/\b\f\n\r\t\x01\x1f\x7f end");
    odd["utf8"] = "\xc3\xa9\xe2\x82\xac\xf0\x9f\x98\x80";
    odd["broken"] = std::string(
        "a\xff\xc3(b\xed\xa0\x80"
        "c\xf4\x90\x80\x80");
    odd["broken \xfe key"] = 1;
    odd["numbers"] = Node::array({0, -1, INT64_MIN, UINT64_MAX, 1.5, -0.25, 1e300, 2.0});
    odd["empty"] = Node::array({Node::object(), Node::array(), "", nullptr, true, false});
    odd["nested"] = Node::object({{"a", Node::array({Node::object({{"b", Node::array()}})})}});
    EXPECT_EQ(Dump(odd), library(odd));
}

}  // namespace
