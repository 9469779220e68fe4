#include "frame/services/anyvalue.h"

#include "tests/services/chunkbytes.h"

#include <limits>
#include <random>
#include <string>
#include <tuple>

namespace {

u16str U(std::string const& text)
{
    return Q_MBToUTF16String(text);
}

std::string Narrow(u16str const& text)
{
    return Q_UTF16ToMBString(text);
}

std::string Json(Q_AnyTree& tree)
{
    return Narrow(Q_AnyTreeWrapper(tree).GetAs_JSON());
}

TEST(AnyValue, TextAndNumberTurnIntoEachOther)
{
    constexpr std::int64_t least = std::numeric_limits<std::int64_t>::min();
    constexpr std::int64_t most = std::numeric_limits<std::int64_t>::max();
    for (std::int64_t const number : {std::int64_t{0}, std::int64_t{-1}, std::int64_t{4294967295}, least, most}) {
        EXPECT_EQ(std::to_string(number), Narrow(Q_Any(number, true).GetAs_Str()));
        EXPECT_EQ(number, Q_Any(U(std::to_string(number))).GetAs_int());
    }
    for (char const* text : {"", " 1", "1 ", "1.5", "+1", "0x10", "-", "9223372036854775808", "one"})
        EXPECT_EQ(Q_Err_NotANumber, Thrown([&] { Q_Any(U(text)).GetAs_int(); })) << text;
    EXPECT_EQ(Q_Err_NotANumber, Thrown([&] { Q_Any().GetAs_int(); }));
    EXPECT_TRUE(Q_Any().GetAs_Str().empty());
}

TEST(AnyTree, HasExactlyThisText)
{
    Q_AnyTree root, component;
    Q_AnyTreeWrapper wrapper(root), part(component);
    EXPECT_EQ("{}", Json(root));
    wrapper.put(U("00"), Q_Any(std::int64_t{1}));
    part.put(U("index"), Q_Any(std::int64_t{4294967295}, false));
    part.put(U("name"), Q_Any(U("\x01/\"\xC3\xA4") + Units({0xD800})));
    wrapper.put(U("a.b"), component);  // one key
    part.put(U("index"), Q_Any(std::int64_t{-3}, false));
    wrapper.put(Units({'x', 0xD800}), component);
    wrapper.put(U("none"), Q_Any());
    wrapper.put(U("00"), Q_Any(U("again")));  // in its place
    std::string const name = "\"name\":\"\\u0001/\\\"\xC3\xA4\xEF\xBF\xBD\"";
    EXPECT_EQ("{\"00\":\"again\",\"a.b\":{\"index\":4294967295," + name + "},\"x\xEF\xBF\xBD\":{\"index\":-3," + name +
                  "},\"none\":null}",
              Json(root));
    EXPECT_EQ(U("again"), wrapper.get_child_any(U("00")).GetAs_Str());
    EXPECT_EQ(Q_Err_NoChild, Thrown([&] { wrapper.get_child_any(U("a")); }));
}

TEST(AnyTree, ReadsWhatIsJson)
{
    std::tuple<char const*, std::string, std::string> const rows[] = {
        {"nothing in it", " { } ", "{}"},
        {"an empty array is an empty tree", "[]", "{}"},
        {"blanks", "{ \"a\" :\t1 ,\r\n\"b\":-2}", "{\"a\":1,\"b\":-2}"},
        {"order is kept, and so are repeated keys", R"({"z":1,"a":2,"z":3})", R"({"z":1,"a":2,"z":3})"},
        {"escapes", R"({"\u0041\ud83d\ude00\/":"\b\f\n\r\t\"\\"})",
         "{\"A\xF0\x9F\x98\x80/\":\"\\b\\f\\n\\r\\t\\\"\\\\\"}"},
        {"arrays", R"([1,"two",[3],{"four":null}])", R"([1,"two",[3],{"four":null}])"},
        {"words", R"({"t":true,"f":false,"n":null})", R"({"t":1,"f":0,"n":null})"},
        {"the widest numbers", "[9223372036854775807,-9223372036854775808]",
         "[9223372036854775807,-9223372036854775808]"},
        {"a value beside children without keys", R"({"a":{"$value":5,"":6}})", R"({"a":{"$value":5,"":6}})"},
        {"the key of a value elsewhere is a key", R"({"a":{"b":6,"$value":5}})", R"({"a":{"b":6,"$value":5}})"},
        {"and it holds one value only", R"({"a":{"$value":{"b":1},"c":2}})", R"({"a":{"$value":{"b":1},"c":2}})"},
    };
    for (auto const& [why, text, again] : rows) {
        SCOPED_TRACE(why);
        Q_AnyTree tree;
        Q_AnyTreeWrapper(tree).put(U("old"), Q_Any(U("gone")));
        ASSERT_EQ(0, Thrown([&] { Q_AnyTreeWrapper(tree).SetFrom_JSON_HackRecoverMagicMixed(U(text)); }));
        EXPECT_EQ(again, Json(tree));
    }
}

TEST(AnyTree, RefusesEverythingElseAndStaysAsItWas)
{
    auto const expectRefused = [](std::string const& text) {
        Q_AnyTree tree;
        Q_AnyTreeWrapper wrapper(tree);
        wrapper.put(U("old"), Q_Any(std::int64_t{1}));
        EXPECT_EQ(Q_Err_BadJson, Thrown([&] { wrapper.SetFrom_JSON_HackRecoverMagicMixed(U(text)); }))
            << text.substr(0, 60);
        EXPECT_EQ("{\"old\":1}", Json(tree)) << text.substr(0, 60);
    };
    for (char const* text : {"", " ", "{", "}", "[1,]", "{\"a\"}", "{\"a\":}", "{\"a\":1,}", "{a:1}", "{'a':1}"})
        expectRefused(text);
    for (char const* text : {"{\"a\":1}x", "{}{}", "1", "\"text\"", "null", "//c\n[]", "[\"\\x\"]", "[\"\\u12\"]"})
        expectRefused(text);
    for (char const* item : {"1.5", "1e3", "1.0", "-", "01", "+1", "NaN", "9223372036854775808", "-9223372036854775809",
                             "99999999999999999999999999", "\"\n\"", "tru"})
        expectRefused("[" + std::string(item) + "]");
    expectRefused("[\"open");
    expectRefused(std::string("{}\0x", 4));
    std::string const deepest = std::string(Q_MaxJsonDepth, '[') + std::string(Q_MaxJsonDepth, ']');
    expectRefused("[" + deepest + "]");
    expectRefused(std::string(1000000, '['));
    expectRefused("[" + deepest.substr(1, 200) + ",");
    Q_AnyTree tree;
    EXPECT_EQ(0, Thrown([&] { Q_AnyTreeWrapper(tree).SetFrom_JSON_HackRecoverMagicMixed(U(deepest)); }));
}

TEST(AnyTree, DepthIsBoundedWhenWritingToo)
{
    Q_AnyTree tree;
    tree.push_back({U("leaf"), Q_AnyTree(Q_Any(std::int64_t{1}))});
    for (int depth = 1; depth <= Q_MaxJsonDepth; ++depth) {
        EXPECT_EQ(0, Thrown([&] { Json(tree); })) << depth;
        Q_AnyTree around;
        around.push_back({U("in"), tree});
        tree.swap(around);
    }
    EXPECT_EQ(Q_Err_BadJson, Thrown([&] { Json(tree); }));
}

Q_AnyTree RandomTree(std::mt19937& random, int depth)
{
    auto const text = [&] {
        u16str result;
        for (unsigned i = random() % 5; i > 0; --i) result.push_back(static_cast<unsigned short>(random() % 0xD800));
        return result;
    };
    Q_AnyTree tree;
    if (random() % 3 == 0)
        tree.data() = random() % 2 ? Q_Any(text()) : Q_Any(static_cast<std::int64_t>(random()) - 1000000);
    for (unsigned i = depth > 0 ? random() % 4 : 0; i > 0; --i) tree.push_back({text(), RandomTree(random, depth - 1)});
    return tree;
}

TEST(AnyTree, EveryTreeComesBackFromItsText)
{
    std::mt19937 random(42);
    for (int i = 0; i < 150; ++i) {
        Q_AnyTree tree = RandomTree(random, 4), back;
        u16str const text = Q_AnyTreeWrapper(tree).GetAs_JSON();
        Q_AnyTreeWrapper(back).SetFrom_JSON_HackRecoverMagicMixed(text);
        EXPECT_TRUE(tree == back) << Narrow(text);
    }
}

TEST(AnyTree, TheWalkGoesParentsFirstAndTurnsBackWhereItIsTold)
{
    Q_AnyTree tree;
    Q_AnyTreeWrapper wrapper(tree);
    wrapper.SetFrom_JSON_HackRecoverMagicMixed(U(R"({"a":{"$value":"mine","b":{"c":1}},"d":{"e":2},"f":3})"));
    std::string seen;
    wrapper.for_each([&](int depth, u16str const& key, Q_AnyTree const& subTree, Q_Any const& value) {
        seen += std::to_string(depth) + Narrow(key) + Narrow(value.GetAs_Str()) + "/" + std::to_string(subTree.size()) +
                " ";
        return key != U("d");
    });
    EXPECT_EQ("1amine/1 2b/1 3c1/0 1d/1 1f3/0 ", seen);
}

}  // namespace
