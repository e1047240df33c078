#include <trelm/config/ini_document.h>

#include <gtest/gtest.h>

using TrelmSDK::IniDocument;

TEST(IniDocument, ReadsSectionsKeysAndValues) {
    IniDocument doc;
    doc.Parse("top=1\n[OSL]\n  ViewportUDIMMaxCount = 64  \nOSLEditorFont=Consolas\n"
              "[OpenImageIO]\nmax_memory_MB=16384.0\n");
    EXPECT_TRUE(doc.Issues().empty());
    EXPECT_EQ(doc.Get("", "top"), "1");
    EXPECT_EQ(doc.Get("OSL", "ViewportUDIMMaxCount"), "64");
    EXPECT_EQ(doc.Get("OSL", "OSLEditorFont"), "Consolas");
    EXPECT_EQ(doc.Get("OpenImageIO", "max_memory_MB"), "16384.0");
    EXPECT_FALSE(doc.Get("OSL", "max_memory_MB"));
    EXPECT_EQ(doc.Sections(), (std::vector<std::string>{"OSL", "OpenImageIO"}));
    EXPECT_EQ(doc.Keys("OSL"), (std::vector<std::string>{"ViewportUDIMMaxCount", "OSLEditorFont"}));
}

TEST(IniDocument, NamesCompareWithoutCase) {
    IniDocument doc;
    doc.Parse("[osl]\nviewportudimmaxcount=8\n");
    EXPECT_TRUE(doc.HasSection("OSL"));
    EXPECT_EQ(doc.Get("OSL", "ViewportUDIMMaxCount"), "8");
    ASSERT_TRUE(doc.Set("OSL", "VIEWPORTUDIMMAXCOUNT", "9"));
    EXPECT_EQ(doc.Serialize(), "[osl]\nviewportudimmaxcount=9\n");
}

TEST(IniDocument, UnchangedTextRoundTripsExactly) {
    const std::string text = "; Trelm settings\n\n# hash comment\n[OSL]\nkey = value ; stays part\n"
                             "this line is junk\n[Broken\n  [ Spaced ]  \nx=\n";
    IniDocument doc;
    doc.Parse(text);
    EXPECT_EQ(doc.Serialize(), text);
    EXPECT_EQ(doc.Get("OSL", "key"), "value ; stays part");
    EXPECT_EQ(doc.Get("Spaced", "x"), "");
}

TEST(IniDocument, MalformedLinesAreReportedKeptAndIgnored) {
    IniDocument doc;
    doc.Parse("[OSL]\nno equals sign\n=orphan value\n[Unclosed\n[]\nkey=5\n[Good] trailing\nk=1\n");
    ASSERT_EQ(doc.Issues().size(), 5u);
    EXPECT_EQ(doc.Issues()[0].line, 2u);
    EXPECT_EQ(doc.Issues()[1].line, 3u);
    EXPECT_EQ(doc.Issues()[2].line, 4u);
    EXPECT_EQ(doc.Issues()[3].line, 5u);
    EXPECT_EQ(doc.Issues()[4].line, 7u);
    // Keys after a broken header still belong to the last good section.
    EXPECT_EQ(doc.Get("OSL", "key"), "5");
    EXPECT_EQ(doc.Get("Good", "k"), "1");
    ASSERT_TRUE(doc.Set("OSL", "key", "6"));
    EXPECT_EQ(doc.Serialize(),
              "[OSL]\nno equals sign\n=orphan value\n[Unclosed\n[]\nkey=6\n[Good] trailing\nk=1\n");
}

TEST(IniDocument, ChangingAValueKeepsTheLinesLayout) {
    IniDocument doc;
    doc.Parse("[OpenImageIO]\n  max_memory_MB   =   16384.0\n");
    ASSERT_TRUE(doc.Set("OpenImageIO", "max_memory_MB", "4096.0"));
    EXPECT_EQ(doc.Serialize(), "[OpenImageIO]\n  max_memory_MB   =   4096.0\n");
}

TEST(IniDocument, NewKeysGoAfterTheLastKeyOfTheirSection) {
    IniDocument doc;
    doc.Parse("[OSL]\na=1\n\n; about the next section\n[Other]\nb=2\n");
    ASSERT_TRUE(doc.Set("OSL", "c", "3"));
    ASSERT_TRUE(doc.Set("Other", "d", "4"));
    ASSERT_TRUE(doc.Set("New", "e", "5"));
    ASSERT_TRUE(doc.Set("", "global", "6"));
    EXPECT_EQ(doc.Serialize(), "global=6\n[OSL]\na=1\nc=3\n\n; about the next section\n"
                               "[Other]\nb=2\nd=4\n\n[New]\ne=5\n");
}

TEST(IniDocument, KeyInEmptySectionGoesRightAfterTheHeader) {
    IniDocument doc;
    doc.Parse("[OSL]\n; nothing yet\n[Other]\n");
    ASSERT_TRUE(doc.Set("OSL", "a", "1"));
    EXPECT_EQ(doc.Serialize(), "[OSL]\na=1\n; nothing yet\n[Other]\n");
}

TEST(IniDocument, RepeatedSectionsReadAsOneAndFirstKeyWins) {
    IniDocument doc;
    doc.Parse("[OSL]\na=1\n[Other]\n[OSL]\na=2\nb=3\n");
    EXPECT_EQ(doc.Get("OSL", "a"), "1");
    EXPECT_EQ(doc.Get("OSL", "b"), "3");
    EXPECT_EQ(doc.Keys("OSL"), (std::vector<std::string>{"a", "b"}));
    EXPECT_EQ(doc.Sections(), (std::vector<std::string>{"OSL", "Other"}));
}

TEST(IniDocument, QuotesKeepBlanksAndRoundTrip) {
    IniDocument doc;
    ASSERT_TRUE(doc.Set("S", "padded", "  two blanks  "));
    ASSERT_TRUE(doc.Set("S", "quoted", "\"already quoted\""));
    ASSERT_TRUE(doc.Set("S", "empty", ""));
    IniDocument reread;
    reread.Parse(doc.Serialize());
    EXPECT_EQ(reread.Get("S", "padded"), "  two blanks  ");
    EXPECT_EQ(reread.Get("S", "quoted"), "\"already quoted\"");
    EXPECT_EQ(reread.Get("S", "empty"), "");
}

TEST(IniDocument, RefusesUnwritableNamesAndValues) {
    IniDocument doc;
    EXPECT_FALSE(doc.Set("OSL", "a=b", "1"));
    EXPECT_FALSE(doc.Set("OSL", "", "1"));
    EXPECT_FALSE(doc.Set("OSL", ";comment", "1"));
    EXPECT_FALSE(doc.Set("O]SL", "a", "1"));
    EXPECT_FALSE(doc.Set(" OSL", "a", "1"));
    EXPECT_FALSE(doc.Set("OSL", "a", "two\nlines"));
    EXPECT_EQ(doc.Serialize(), "");
}

TEST(IniDocument, KeepsCrLfAndByteOrderMark) {
    IniDocument doc;
    doc.Parse("\xEF\xBB\xBF[OSL]\r\na=1\r\n");
    EXPECT_EQ(doc.Get("OSL", "a"), "1");
    ASSERT_TRUE(doc.Set("OSL", "b", "2"));
    EXPECT_EQ(doc.Serialize(), "\xEF\xBB\xBF[OSL]\r\na=1\r\nb=2\r\n");
}

TEST(IniDocument, RemoveDropsOnlyThatLine) {
    IniDocument doc;
    doc.Parse("[OSL]\n; keep\na=1\nb=2\n");
    EXPECT_TRUE(doc.Remove("osl", "A"));
    EXPECT_FALSE(doc.Remove("OSL", "a"));
    EXPECT_EQ(doc.Serialize(), "[OSL]\n; keep\nb=2\n");
}

TEST(IniDocument, LastLineWithoutBreakIsRead) {
    IniDocument doc;
    doc.Parse("[OSL]\na=1");
    EXPECT_EQ(doc.Get("OSL", "a"), "1");
    EXPECT_EQ(doc.Serialize(), "[OSL]\na=1\n");
}
