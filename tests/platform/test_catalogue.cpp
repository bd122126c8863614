// Messages from a catalogue: whatever it says, only recorded inserts of the right type are read.
#include <cstdlib>
#include <string>

#include "error_support.h"
#include "support/scratch.h"

namespace
{
// A catalogue of one set, found through NLSPATH by the name "platform.cat".
class Catalogue : public testing::Test
{
protected:
    void make(const std::string &messages)
    {
        qn::test::write_file(folder_ / "platform.msg", "$set 1\n" + messages);
        const std::string command = "gencat " + folder_ / "platform.cat" + " " + folder_ / "platform.msg";
        ASSERT_EQ(std::system(command.c_str()), 0);
        ASSERT_EQ(setenv("NLSPATH", (folder_ / "%N").c_str(), 1), 0);
    }

    template <typename... insert_types>
    static std::string message(int number, const char *text, insert_types... inserts)
    {
        cu_set_error_1(1, nullptr, "platform.cat", 1, number, text, inserts...);
        return message_of(*present_error());
    }

private:
    qn::test::scratch folder_;
};

TEST_F(Catalogue, ItsTextIsPreferredToTheDefault)
{
    make("7 Datei %s, Fehler %d\\n\n");
    EXPECT_EQ(message(7, "file %s, error %d\n", "a.trc", 5), "Datei a.trc, Fehler 5\n");
}

TEST_F(Catalogue, AMissingMessageGivesTheDefault)
{
    make("7 other\n");
    EXPECT_EQ(message(8, "default %d", 5), "default 5");
}

TEST_F(Catalogue, AMissingCatalogueGivesTheDefault)
{
    setenv("NLSPATH", "/nonexistent/%N", 1);
    EXPECT_EQ(message(7, "default %s", "text"), "default text");
}

TEST_F(Catalogue, APositionReordersTheInserts)
{
    make("1 %2$d in %1$s\n");
    EXPECT_EQ(message(1, "%s has %d", "x", 3), "3 in x");
}

TEST_F(Catalogue, AnotherFormOfTheSameTypeFits)
{
    make("1 %#06x %c\n");
    EXPECT_EQ(message(1, "%d %d", 255, 'k'), "0x00ff k");
}

TEST_F(Catalogue, FewerConversionsThanInsertsFit)
{
    make("1 just %d\n");
    EXPECT_EQ(message(1, "%d %s", 3, "unused"), "just 3");
}

TEST_F(Catalogue, AStringConversionOfANumberGivesTheDefault)
{
    make("1 evil %s\n");
    EXPECT_EQ(message(1, "good %d", 42), "good 42");
}

TEST_F(Catalogue, MoreConversionsThanInsertsGiveTheDefault)
{
    make("1 %s %s %s %s\n");
    EXPECT_EQ(message(1, "one %s", "insert"), "one insert");
}

TEST_F(Catalogue, AStoringConversionGivesTheDefault)
{
    make("1 %s%n\n");
    EXPECT_EQ(message(1, "safe %s", "text"), "safe text");
}

TEST_F(Catalogue, AWiderIntegerThanRecordedGivesTheDefault)
{
    make("1 %ld\n");
    EXPECT_EQ(message(1, "int %d", 5), "int 5");
}

TEST_F(Catalogue, AStarWithoutAnIntegerGivesTheDefault)
{
    make("1 %*s\n2 %2$*1$s\n");
    EXPECT_EQ(message(1, "<%s>", "x"), "<x>");
    EXPECT_EQ(message(2, "<%s%s>", "x", "y"), "<xy>");
}

TEST_F(Catalogue, AConversionThatMakesNoSenseGivesTheDefault)
{
    make("1 %d %y\n2 %d %\n");
    EXPECT_EQ(message(1, "one %d", 1), "one 1");
    EXPECT_EQ(message(2, "two %d", 2), "two 2");
}

TEST_F(Catalogue, AFileThatIsNoCatalogueGivesTheDefault)
{
    make("1 x\n");
    std::string path = std::getenv("NLSPATH");
    path.replace(path.find("%N"), 2, "platform.cat");
    qn::test::write_file(path, std::string(5000, '\xff'));
    EXPECT_EQ(message(1, "default %d", 4), "default 4");
}
} // namespace
