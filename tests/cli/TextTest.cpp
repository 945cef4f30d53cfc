#include <gtest/gtest.h>

#include "cli/ExitStatus.h"
#include "cli/ItemText.h"
#include "cli/Text.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tessaly/QVErrors.h"
#include "tests/cli/ScriptedHost.h"

namespace droxa::testing {
namespace {

TEST(Text, controlsAndForeignBytesAreEscaped) {
  EXPECT_EQ(escapedText("plain ä 漢 😀"), "plain ä 漢 😀");
  EXPECT_EQ(escapedText("a\nb\tc\rd\x1b[0m\x7f"), "a\\nb\\tc\\rd\\x1b[0m\\x7f");
  EXPECT_EQ(escapedText("\xff\xfe"), "\\xff\\xfe");
  EXPECT_EQ(escapedText("back\\slash"), "back\\\\slash");
  EXPECT_EQ(escapedText("\xc2\x9b"), "\\xc2\\x9b");
  EXPECT_EQ(escapedText("\xe2\x82"), "\\xe2\\x82");
}

TEST(Text, aCountOfOneIsSingular) {
  EXPECT_EQ(countText(0, "folder"), "0 folders");
  EXPECT_EQ(countText(1, "folder"), "1 folder");
  EXPECT_EQ(countText(2, "folder"), "2 folders");
}

TEST(Text, onlyWellFormedSequencesAreUTF8) {
  for (const char *text : {"", "a", "ä", "漢", "😀", "\xef\xbf\xbf", "\xf4\x8f\xbf\xbf"})
    EXPECT_TRUE(isValidUTF8(text)) << text;
  for (const char *text : {"\x80", "\xc0\x80", "\xe0\x80\x80", "\xed\xa0\x80", "\xf4\x90\x80\x80",
                           "\xf5\x80\x80\x80", "a\xe2\x82"})
    EXPECT_FALSE(isValidUTF8(text)) << text;
}

TEST(Text, base64) {
  EXPECT_EQ(base64Text(""), "");
  EXPECT_EQ(base64Text("f"), "Zg==");
  EXPECT_EQ(base64Text("fo"), "Zm8=");
  EXPECT_EQ(base64Text("foo"), "Zm9v");
  EXPECT_EQ(base64Text("foob"), "Zm9vYg==");
}

TEST(Text, times) {
  EXPECT_EQ(isoTimeText(1), "1970-01-01T00:00:00.000000001Z");
  EXPECT_EQ(isoTimeText(-1), "1969-12-31T23:59:59.999999999Z");
  EXPECT_EQ(localTimeText(0), "-");
  EXPECT_EQ(durationText(59'000'000'000), "59 s");
  EXPECT_EQ(durationText(3'600'000'000'000), "1 h 0 min");
  EXPECT_EQ(durationText(90'000'000'000'000), "1 d 1 h");
}

TEST(ItemText, theLongLineHasTypePermissionsSizeIdentifierAndName) {
  NSFileProviderItemFields fields = item("d12", "a\nb");
  fields.documentSize = 1234;
  EXPECT_EQ(longLine(fields), "-rw-r--r-- u         1234  -                 d12       a\\nb");
  EXPECT_EQ(longLine(folder("i3", "x")).substr(0, 1), "d");
  EXPECT_EQ(longLine(item("i3", "x", NSFileProviderItemKind::alias)).substr(0, 1), "@");
}

TEST(ItemText, eachKindOfChangeHasItsLine) {
  FPDChange change;
  change.identifier = "d1";
  change.item = item("d1", "name");
  change.kind = FPDChange::Kind::added;
  EXPECT_EQ(changeLine(change), "+ name  (d1)");
  change.kind = FPDChange::Kind::changed;
  EXPECT_EQ(changeLine(change), "~ name  (d1)");
  change.kind = FPDChange::Kind::removed;
  change.item.reset();
  EXPECT_EQ(changeLine(change), "- ?  (d1)");
  change.oldName = "was";
  EXPECT_EQ(changeLine(change), "- was  (d1)");
  EXPECT_EQ(changeJSON(change), R"({"change":"removed","identifier":"d1","oldName":"was"})");
  change.kind = FPDChange::Kind::relisted;
  EXPECT_EQ(changeLine(change), "* listed anew: changes may have been missed  (d1)");
}

TEST(ExitStatus, errorsEndWithTheirSysexit) {
  const auto status = [](const char *domain, std::int64_t code) {
    return exitStatusForError(NSError(domain, code));
  };
  EXPECT_EQ(status(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem), 66);
  EXPECT_EQ(status(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated), 77);
  EXPECT_EQ(status(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable), 69);
  EXPECT_EQ(status(NSCocoaErrorDomain, NSXPCConnectionInvalid), 69);
  EXPECT_EQ(status(NSCocoaErrorDomain, NSXPCConnectionInterrupted), 69);
  EXPECT_EQ(status(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid), 75);
  EXPECT_EQ(status(QVTessalyErrorDomain, QVErrorLoggedOut), 77);
  EXPECT_EQ(status(QVTessalyErrorDomain, QVErrorUnreadable), 77);
  EXPECT_EQ(status("elsewhere", 5), 1);
}

}  // namespace
}  // namespace droxa::testing
