// SPDX-License-Identifier: GPL-2.0-or-later
// What can only be meant otherwise than it is written.
#include <map>

#include "tests/unit/index/query_parse_fixture.h"

namespace fileindexd {

class QuerySlipsTest : public QueryParseTest {
 protected:
  // Each is refused, and it is told how it is to be written.
  static void ExpectForms(const std::map<std::string, std::string>& forms) {
    for (const auto& [text, form] : forms) {
      const std::string what = ErrorOf(text).what;
      EXPECT_NE(what.find(", as in " + form + " ("), std::string::npos) << text << ": " << what;
      EXPECT_NE(what.find("in quotes"), std::string::npos) << what;
    }
  }
};

// Fields' names with a slip in them.
TEST_F(QuerySlipsTest, WhatCanOnlyBeMeantForAFieldIsRefused) {
  ExpectAll({
      {"sise:>1G", "?0"},        {"a -sise:1G", "?3"},   {"(sise:1G)", "?1"},
      {"autor:x", "?0"},         {"form:bob", "?0"},     {"tags:sea", "?0"},
      {"undr:/srv/data", "?0"},  {"a undr:/srv", "?2"},  {"shere:/x", "?0"},
      {"SIEZ:1M", "?0"},         {"exxt:pdf", "?0"},     {"kidn:video", "?0"},
      {"-(a kidn:video)", "?4"}, {"modifed:2024", "?0"}, {"modifide:2024", "?0"},
      {"artits:x", "?0"},        {"durasoin:>3m", "?0"}, {"foo:>3", "?0"},
      {"foo:<=3", "?0"},         {"foo:\"a b\"", "?0"},  {"c:\"a b\"", "?0"},
  });
  EXPECT_EQ(LineOf("a sise:>1G"),
            "a sise:>1G: there is no field 'sise'; 'size'? (a word with a colon stands in quotes) "
            "(character 3, at: sise:>1G)");
}

// Of several the one that is listed first.
TEST_F(QuerySlipsTest, TheFieldThatIsNearestIsNamed) {
  for (const auto& [text, meant] : std::map<std::string, std::string>{{"kidn:x", "kind"},
                                                                      {"albm:x", "album"},
                                                                      {"keywrod:x", "keyword"},
                                                                      {"keywrods:x", "keywords"},
                                                                      {"heigth:5", "height"},
                                                                      {"widht:5", "width"},
                                                                      {"brtrate:5", "bitrate"}}) {
    const std::string what = ErrorOf(text).what;
    EXPECT_NE(what.find("; '" + meant + "'?"), std::string::npos) << text << ": " << what;
  }
  EXPECT_EQ(Parsed("keyword2:x"), "keyword2:x");
}

TEST_F(QuerySlipsTest, WordsWithColonsAreWords) {
  ExpectAll({
      {"http://x", "http://x"},
      {"https://example.org/a?b=c:d", "https://example.org/a?b=c:d"},
      {"file:///x", "file:///x"},
      {"texts://x", "texts://x"},
      {"fs::path id::x tags::", "(fs::path id::x tags::)"},
      {"C:\\x c:/y x:y c:", "(C:\\x c:/y x:y c:)"},
      {"12:30", "12:30"},
      {"std:vector std:move", "(std:vector std:move)"},
      {"go:generate id:5", "(go:generate id:5)"},
      {"number:5 computer:7", "(number:5 computer:7)"},
      {"atrits:x durattoin:3m", "(atrits:x durattoin:3m)"},
      {"exr:pdf SIZ:1 si:x us:x", "(exr:pdf SIZ:1 si:x us:x)"},
      {"todo:x note:x main:x", "(todo:x note:x main:x)"},
      {"knsid:x", "knsid:x"},
      {"modfd:x", "modfd:x"},
      {"Note: exr: size", "(Note: exr: size)"},
      {"\"size:pdf\" \"exxt:pdf\"", "(\"size:pdf\" \"exxt:pdf\")"},
  });
}

TEST_F(QuerySlipsTest, FieldsWithoutTheirColonAreRefused) {
  ExpectAll({
      {"size>10M", "?0"},
      {"a Width<100", "?2"},
      {"modified>=2024", "?0"},
      {"size=10M", "?0"},
      {"a size==10M", "?2"},
      {"modified<2024", "?0"},
      {"ext=pdf", "?0"},
      {"a -ext=pdf", "?3"},
      {"(kind=video)", "?1"},
      {"name<x", "?0"},
      {"title=\"moby dick\"", "?0"},
      {"from<x", "?0"},
      {"size> 10M", "?0"},
      {"size=", "?0"},
      {"xsize>10", "xsize>10"},
      {"a=b sizes=1 a<b x>=y", "(a=b sizes=1 a<b x>=y)"},
      {"size-x=1 size_=1 \"size=10M\"", "(size-x=1 size_=1 \"size=10M\")"},
      {"ext!=pdf", "?0"},
      {"a size!=10M", "?2"},
      {"a=size=1 a!=b size!", "(a=size=1 a!=b size!)"},
  });
  ExpectForms({{"size=10M", "size:10M"},
               {"size==10M", "size:10M"},
               {"a SIZE>10M b", "size:>10M"},
               {"(size>=10M)", "size:>=10M"},
               {"size=>10M", "size:>=10M"},
               {"size=<10M", "size:<=10M"},
               {"modified<2024 x", "modified:<2024"},
               {"ext=pdf", "ext:pdf"},
               {"tag>sea", "tag:sea"},
               {"title=\"moby dick\" x", "title:\"moby dick\""},
               {"title=\"moby", "title:\"moby\""},
               {"size!=10M", "-size:10M"},
               {"ext!=pdf", "-ext:pdf"},
               {"size> 10M", "size:>10M"}});
}

TEST_F(QuerySlipsTest, BlanksDoNotPartAFieldFromItsColonOrComparison) {
  ExpectAll({
      {"kind:video size >10M", "?11"},
      {"size > 10M", "?0"},
      {"a size <=10M b", "?2"},
      {"size =10M", "?0"},
      {"size != 10M", "?0"},
      {"a -size > 10M", "?3"},
      {"(size >10M)", "?1"},
      {"name:(a size > 1)", "?8"},
      {"text : whale", "?0"},
      {"text :whale", "?0"},
      {"text :", "?0"},
      {"Size\u3000> 10M", "?0"},
      {"name:size > 10M", "(name:size name:*>* 10M)"},
      {"size 10M", "(size 10M)"},
      {"size", "size"},
      {"a size b", "(a size b)"},
      {"size - 10M", "(size name:*-* 10M)"},
      {"size -10M", "(size -10M)"},
      {"sizes > 10M", "(sizes name:*>* 10M)"},
      {"\"size\" > 10M", "(\"size\" name:*>* 10M)"},
      {"text ::x", "(text ::x)"},
      {"text :) x", "(text name:*:)* x)"},
      {"text :-( x", "(text name:*:-(* x)"},
      {"text :(", "(text name:*:(*)"},
      {"text :(a b)", "?0"},
      {"text ! x", "(text name:*!* x)"},
      {"(name) > x", "(name name:*>* x)"},
  });
  ExpectForms({{"size > 10M", "size:>10M"},
               {"a size >=10M b", "size:>=10M"},
               {"size = 10M", "size:10M"},
               {"size != 10M", "-size:10M"},
               {"text : whale", "text:whale"},
               {"text :\"a b\"", "text:\"a b\""},
               {"text =x", "text:x"},
               {"from <bob@home>", "from:bob@home"},
               {"modified > -7d", "modified:>-7d"}});
}

TEST_F(QuerySlipsTest, NoExampleIsGivenThatWouldBeRefusedItself) {
  for (const char* text :
       {"size=", "size = -5", "title=\"\"", "title=\"", "text : :", "title < -moby", "size > (",
        "size > abc", "size = \"10 M\"", "kind = foo", "from <a*b>", "under = srv", "year : x,y",
        "title:-(a b)", "title:-moby*x", "name:-a/b", "ext:-*.pdf"}) {
    const std::string what = ErrorOf(text).what;
    EXPECT_EQ(what.find("as in"), std::string::npos) << what;
    EXPECT_NE(what.find("in quotes"), std::string::npos) << text << ": " << what;
  }
}

TEST_F(QuerySlipsTest, FieldsOfTextCompareNothingAndLeaveOutNothing) {
  ExpectAll({
      {"camera:>5", "?7"},
      {"a ext:>pdf", "?6"},
      {"ext:pdf,>jpg", "?8"},
      {"ext:-pdf", "?4"},
      {"name:>3", "?5"},
      {"name:<=x*", "?5"},
      {"name:->x", "?5"},
      {"name:-*.txt", "?5"},
      {"title:-moby", "?6"},
      {"-title:-moby a", "?7"},
      {"title:=moby", "?6"},
      {"text:-5", "?5"},
      {"path:-draft", "?5"},
      {"title:(a >5)", "?9"},
      {"title:(a -b)", "(title:a -title:b)"},
      {"title:\"-moby\"", "title:\"-moby\""},
      {"name:\"-*.txt\"", "name:-*.txt"},
      {"name:\"->x\"", "name:\"->x\""},
      {"path:\"-draft\"", "path:*-draft*"},
      {"ext:\"-x\",pdf", "ext:-x,pdf"},
      {"name:*-draft*", "name:*-draft*"},
      {"name:-", "name:*-*"},
      {"name:->", "name:*->*"},
      {"title:a-b name:a>b", "(title:a-b name:a>b)"},
  });
  EXPECT_EQ(ErrorOf("title:-moby").what,
            "a '-' that leaves out stands in front of the field, as in -title:moby (a value that "
            "begins with - stands in quotes)");
  EXPECT_EQ(ErrorOf("name:--draft").what,
            "a '-' that leaves out stands in front of the field, as in -name:draft (a value that "
            "begins with - stands in quotes)");
  EXPECT_EQ(ErrorOf("name:-\"foo bar\"").what,
            "a '-' that leaves out stands in front of the field (a value that begins with - stands "
            "in quotes)");
  EXPECT_EQ(ErrorOf("camera:>5").what,
            "camera: compares nothing (a value that begins with > stands in quotes)");
}

TEST_F(QuerySlipsTest, WhatOpensNothingClosesNothing) {
  ExpectAll({
      {"report)", "?6"},
      {"report))", "?7"},
      {"foo(1))", "?6"},
      {"max(a, b)", "?8"},
      {"annual report) x", "?13"},
      {"(annual)report)", "?14"},
      {"name:report)", "?11"},
      {"name:*)", "?6"},
      {"kind:photo)", "?10"},
      {"ext:\"pdf\",jpg)", "?13"},
      {"title:)", "?6"},
      {"\"report)\" name:\"*)\"", "(\"report)\" name:*))"},
      {"name:*)*", "name:*)*"},
      {"report)*", "?6"},
      {"name:report)**", "?11"},
      {"report\"*", "?6"},
      {"name:report\"*", "?11"},
      {"annual report\"", "?13"},
      {"report\" x", "?6"},
      {"(annual report\")", "?14"},
      {"name:report\"", "?11"},
      {"title:report\"", "?12"},
      {"path:a/b\"", "?8"},
      {"ext:pdf\"", "?7"},
      {"ext:pdf\",jpg", "?7"},
      {"a\"b", "a\"b"},
      {"name:*17\" path:*17\"", "(name:*17\" path:*17\"*)"},
  });
  EXPECT_EQ(ErrorOf("report)").what,
            "this bracket closes nothing (a word that ends with one stands in quotes)");
  EXPECT_EQ(ErrorOf("report\"").what,
            "this quote closes nothing; one opens in front of the first word");
}

TEST_F(QuerySlipsTest, TwoMinusLeaveOutNothing) {
  ExpectAll({
      {"report --draft", "?7"},
      {"--draft report", "?0"},
      {"---draft", "?0"},
      {"a NOT --b", "?6"},
      {"a --(b OR c)", "?2"},
      {"a --\"b c\"", "?2"},
      {"a --name:b", "?2"},
      {"name:(a --b)", "?8"},
      {"a \"--b\"", "(a \"--b\")"},
      {"report --", "(report name:*--*)"},
  });
  EXPECT_EQ(ErrorOf("a --b").what,
            "one '-' leaves out (a word that begins with two stands in quotes)");
}

}  // namespace fileindexd
