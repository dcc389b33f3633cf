// Option parsing, number and size parsing, and the progress line.
#include <gtest/gtest.h>
#include <stdio.h>
#include <stdlib.h>

#include <vector>

#include "args.h"
#include "progress.h"

namespace {

using namespace kivcli;

const OptionSpec kSpecs[] = {
    {'e', "effect", true},
    {'o', "output", true},
    {'v', "verbose", false},
    {0, "thumb", true},
};

bool parse(std::vector<const char*> argv, ParsedArgs* out, std::string* error) {
    argv.insert(argv.begin(), "cmd");
    return parseArgs(static_cast<int>(argv.size()), const_cast<char**>(argv.data()), 1, kSpecs, 4,
                     out, error);
}

TEST(Args, AcceptedForms) {
    ParsedArgs a;
    std::string error;
    ASSERT_TRUE(parse({"-e", "403", "in1.png", "--output=out", "-v", "--thumb", "64", "in2.jpg"},
                      &a, &error))
        << error;
    EXPECT_EQ("403", a.get("effect"));
    EXPECT_EQ("out", a.get("output"));
    EXPECT_EQ("64", a.get("thumb"));
    EXPECT_TRUE(a.has("verbose"));
    EXPECT_EQ(std::vector<std::string>({"in1.png", "in2.jpg"}), a.positionals);

    ParsedArgs b;
    ASSERT_TRUE(parse({"-eSepia", "-e", "Negative", "--", "-v", "-"}, &b, &error));
    EXPECT_EQ("Negative", b.get("effect"));  // the last one wins
    EXPECT_FALSE(b.has("verbose"));          // after "--" it is a file name
    EXPECT_EQ(std::vector<std::string>({"-v", "-"}), b.positionals);
    EXPECT_EQ("fallback", b.get("output", "fallback"));
    // A value may itself start with a dash.
    ParsedArgs c;
    ASSERT_TRUE(parse({"-e", "-1"}, &c, &error));
    EXPECT_EQ("-1", c.get("effect"));
}

TEST(Args, RejectedForms) {
    struct Case {
        std::vector<const char*> argv;
        const char* message;
    } cases[] = {
        {{"-x"}, "unknown option '-x'"},
        {{"--nope"}, "unknown option '--nope'"},
        {{"--nope=1"}, "unknown option '--nope'"},
        {{"-e"}, "option '--effect' needs a value"},
        {{"in.png", "--output"}, "option '--output' needs a value"},
        {{"--verbose=yes"}, "option '--verbose' takes no value"},
        {{"-vx"}, "option '-v' takes no value"},
    };
    for (const Case& c : cases) {
        ParsedArgs a;
        std::string error;
        EXPECT_FALSE(parse(c.argv, &a, &error)) << c.message;
        EXPECT_EQ(c.message, error);
    }
}

TEST(Args, Numbers) {
    int v = -7;
    EXPECT_TRUE(parseInt("98", 1, 100, &v));
    EXPECT_EQ(98, v);
    EXPECT_TRUE(parseInt("-5", -10, 10, &v));
    EXPECT_EQ(-5, v);
    v = 42;
    for (const char* bad : {"101", "0", "12abc", ""})
        EXPECT_FALSE(parseInt(bad, 1, 100, &v)) << bad;
    EXPECT_FALSE(parseInt("99999999999999999999", 1, 2147483647, &v));
    EXPECT_EQ(42, v);  // untouched on failure

    int w = 0, h = 0;
    EXPECT_TRUE(parseSize("640x480", 64, 8192, &w, &h));
    EXPECT_EQ(640, w);
    EXPECT_EQ(480, h);
    EXPECT_TRUE(parseSize("100X64", 64, 8192, &w, &h));
    EXPECT_EQ(64, h);
    for (const char* bad : {"640", "640x", "63x100", "640x480x2"})
        EXPECT_FALSE(parseSize(bad, 64, 8192, &w, &h)) << bad;
}

TEST(Progress, Line) {
    const std::string dots30(30, '.'), hashes15(15, '#'), dots15(15, '.');
    ASSERT_EQ(30, kProgressBarWidth);
    EXPECT_EQ("[" + dots30 + "] 0/4  a.png", progressLine(0, 4, "a.png"));
    EXPECT_EQ("[" + hashes15 + dots15 + "] 2/4  b", progressLine(2, 4, "b"));
    // 9 of 30 cells for 3/10; the count is right-aligned to the width of "10/10".
    EXPECT_EQ("[" + std::string(9, '#') + std::string(21, '.') + "]  3/10",
              progressLine(3, 10, ""));
    EXPECT_EQ("[" + std::string(30, '#') + "] 10/10", progressLine(12, 10, nullptr));
    EXPECT_EQ("[" + dots30 + "] 0/1", progressLine(-3, 0, ""));
    // Long names keep their end, where the file name is.
    std::string longName = std::string(20, 'd') + "/" + std::string(29, 'f') + ".png";
    std::string line = progressLine(1, 1, longName.c_str());
    EXPECT_EQ("..." + longName.substr(longName.size() - 37), line.substr(line.size() - 40));
}

TEST(Progress, DrawsOnlyWhenEnabled) {
    char* text = nullptr;
    size_t size = 0;
    FILE* out = open_memstream(&text, &size);
    ASSERT_NE(nullptr, out);
    {
        ProgressBar off(out, 3, false);
        off.update(1, "x");
    }
    {
        ProgressBar bar(out, 2, true);
        bar.update(0, "long-name.png");
        bar.update(1, "b");
    }
    fclose(out);
    std::string got(text, size);
    free(text);
    // Redrawn in place; the shorter second line blanks the first one's tail;
    // the destructor ends the line.
    std::string first = progressLine(0, 2, "long-name.png");
    std::string second = progressLine(1, 2, "b");
    EXPECT_EQ("\r" + first + "\r" + second + std::string(first.size() - second.size(), ' ') + "\n",
              got);
}

}  // namespace
