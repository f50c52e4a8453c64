#include "framework/host/xmlutil.h"

#include <libxml/parser.h>
#include <libxml/tree.h>

#include <cstring>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace {

struct DocFree {
  void operator()(xmlDoc* doc) const { xmlFreeDoc(doc); }
};
using Doc = std::unique_ptr<xmlDoc, DocFree>;

Doc Parse(const std::string& text) {
  return Doc(xmlReadMemory(text.data(), static_cast<int>(text.size()), "alert.xml", nullptr,
                           XML_PARSE_NONET | XML_PARSE_NOERROR | XML_PARSE_NOWARNING));
}

// Looks up a path given as a brace list; "-" when not found.
std::string Lookup(xmlDoc* doc, std::list<std::string> path) {
  std::string value = "untouched";
  const int rc = FindXmlKeyVal(doc, path, value);
  if (rc != 0) {
    EXPECT_EQ(rc, -1);
    EXPECT_EQ(value, "untouched");
    return "-";
  }
  return value;
}

const char kHikAlert[] = R"(<?xml version="1.0" encoding="UTF-8"?>
<EventNotificationAlert version="1.0" xmlns="http://www.hikvision.com/ver10/XMLSchema">
<ipAddress>192.168.1.64</ipAddress>
<portNo>80</portNo>
<protocol>HTTP</protocol>
<macAddress>44:19:b6:00:00:01</macAddress>
<channelID>1</channelID>
<dateTime>2017-05-04T11:20:02+08:00</dateTime>
<activePostCount>5</activePostCount>
<eventType>VMD</eventType>
<eventState>active</eventState>
<eventDescription>Motion alarm</eventDescription>
<DetectionRegionList>
<DetectionRegionEntry>
<regionID>1</regionID>
<sensitivityLevel>80</sensitivityLevel>
</DetectionRegionEntry>
</DetectionRegionList>
</EventNotificationAlert>
)";

TEST(FindXmlKeyValTest, AlertWithDefaultNamespace) {
  Doc doc = Parse(kHikAlert);
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "eventType"}), "VMD");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "activePostCount"}), "5");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "eventState"}), "active");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "DetectionRegionList",
                               "DetectionRegionEntry", "sensitivityLevel"}),
            "80");
}

TEST(FindXmlKeyValTest, PsiaAlertInputRecord) {
  Doc doc = Parse(R"(<?xml version="1.0" encoding="UTF-8"?>
<EventNotificationAlert version="1.0" xmlns="urn:psialliance-org">
  <ipAddress>10.0.0.7</ipAddress>
  <inputIOPortID>2</inputIOPortID>
  <activePostCount>1</activePostCount>
  <eventType>IO</eventType>
  <eventState>inactive</eventState>
</EventNotificationAlert>)");
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "eventType"}), "IO");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "eventState"}), "inactive");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "inputIOPortID"}), "2");
}

TEST(FindXmlKeyValTest, RootAloneGivesItsWholeText) {
  Doc doc = Parse("<a><b>1</b><c>2</c></a>");
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"a"}), "12");
}

TEST(FindXmlKeyValTest, MissingElement) {
  Doc doc = Parse(kHikAlert);
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "inputIOPortID"}), "-");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "eventType", "deeper"}), "-");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "EventType"}), "-");
}

TEST(FindXmlKeyValTest, PathMustStartAtRoot) {
  Doc doc = Parse(kHikAlert);
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"eventType"}), "-");
  EXPECT_EQ(Lookup(doc.get(), {"Alert", "eventType"}), "-");
  EXPECT_EQ(Lookup(doc.get(), {"", "EventNotificationAlert", "eventType"}), "-");
  EXPECT_EQ(Lookup(doc.get(), {"DetectionRegionList", "DetectionRegionEntry", "regionID"}), "-");
}

TEST(FindXmlKeyValTest, EmptyPathOrNoDocument) {
  Doc doc = Parse(kHikAlert);
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {}), "-");
  EXPECT_EQ(Lookup(nullptr, {"EventNotificationAlert", "eventType"}), "-");
}

TEST(FindXmlKeyValTest, FirstMatchAtEachLevelIsTaken) {
  // The second <entry> has <id>; the walk stays in the first one and does not find it.
  Doc doc = Parse(R"(<root>
  <entry><name>first</name></entry>
  <entry><name>second</name><id>42</id></entry>
</root>)");
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"root", "entry", "name"}), "first");
  EXPECT_EQ(Lookup(doc.get(), {"root", "entry", "id"}), "-");
}

TEST(FindXmlKeyValTest, OnlyDirectChildrenMatch) {
  // eventType exists, but only deeper than the level asked for.
  Doc doc = Parse(R"(<EventNotificationAlert>
  <wrapper><eventType>VMD</eventType></wrapper>
</EventNotificationAlert>)");
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "eventType"}), "-");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "wrapper", "eventType"}), "VMD");
}

TEST(FindXmlKeyValTest, NestedTextIsConcatenated) {
  Doc doc = Parse(R"(<r><msg>Motion <b>in</b> zone <![CDATA[<1>]]>&amp; more</msg></r>)");
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"r", "msg"}), "Motion in zone <1>& more");
}

TEST(FindXmlKeyValTest, EmptyElementGivesEmptyText) {
  Doc doc = Parse("<r><eventType/><eventState></eventState></r>");
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"r", "eventType"}), "");
  EXPECT_EQ(Lookup(doc.get(), {"r", "eventState"}), "");
}

TEST(FindXmlKeyValTest, PrefixedNamespacesMatchByLocalName) {
  Doc doc = Parse(R"(<?xml version="1.0"?>
<ev:EventNotificationAlert xmlns:ev="urn:psialliance-org" xmlns:x="urn:other">
  <x:note>ignored</x:note>
  <ev:eventType>VMD</ev:eventType>
  <ev:activePostCount>12</ev:activePostCount>
</ev:EventNotificationAlert>)");
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "eventType"}), "VMD");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "note"}), "ignored");
  EXPECT_EQ(Lookup(doc.get(), {"EventNotificationAlert", "activePostCount"}), "12");
  EXPECT_EQ(Lookup(doc.get(), {"ev:EventNotificationAlert", "eventType"}), "-");
}

TEST(FindXmlKeyValTest, CommentsAndProcessingInstructionsAreNotElements) {
  Doc doc = Parse("<r><!--eventType--><?eventType x?><eventType>IO</eventType></r>");
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(Lookup(doc.get(), {"r", "eventType"}), "IO");
}

TEST(XmlLockTest, SameMutexEverywhere) {
  std::mutex* here = &XmlLock();
  std::mutex* there = nullptr;
  std::thread other([&] { there = &XmlLock(); });
  other.join();
  EXPECT_EQ(here, there);
  bool taken_while_held = true;
  {
    std::lock_guard<std::mutex> hold(XmlLock());
    std::thread contender([&] {
      taken_while_held = XmlLock().try_lock();
      if (taken_while_held) XmlLock().unlock();
    });
    contender.join();
  }
  EXPECT_FALSE(taken_while_held);
}

TEST(XmlLockTest, ParsingUnderTheLockFromManyThreads) {
  // What the alert detectors do: parse, look up, free and clean up, all under XmlLock.
  // Start from a clean libxml2 as a fresh process would: the earlier tests parsed on this
  // thread, and libxml2 2.9 leaks a thread's globals when another thread cleans up after it.
  {
    std::lock_guard<std::mutex> hold(XmlLock());
    xmlCleanupParser();
  }
  std::vector<std::thread> threads;
  std::vector<int> found(4, 0);
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&, t] {
      for (int i = 0; i < 50; ++i) {
        std::lock_guard<std::mutex> hold(XmlLock());
        xmlDoc* doc = xmlParseMemory(kHikAlert, static_cast<int>(std::strlen(kHikAlert)));
        std::list<std::string> path{"EventNotificationAlert", "eventType"};
        std::string value;
        if (doc != nullptr && FindXmlKeyVal(doc, path, value) == 0 && value == "VMD") ++found[t];
        xmlFreeDoc(doc);
        xmlCleanupParser();
      }
    });
  }
  for (std::thread& t : threads) t.join();
  for (int count : found) EXPECT_EQ(count, 50);
}

}  // namespace
