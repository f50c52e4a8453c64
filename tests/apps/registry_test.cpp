// The class registry: its rows, the factories, the name suggestions, `evwatch classes`, and
// that every class can be watched in the simulator.

#include "apps/evwatch/registry.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <set>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "sim/emulation.h"
#include "tests/apps/apptestutil.h"

namespace evwatch {
namespace {

TEST(RegistryTest, NamesAreUniqueAndRowsComplete) {
  std::set<std::string> names;
  for (const DetectorClass& c : DetectorClasses()) {
    EXPECT_TRUE(names.insert(c.name).second) << c.name;
    EXPECT_FALSE(c.maker.empty()) << c.name;
    EXPECT_FALSE(c.how.empty()) << c.name;
    EXPECT_EQ(c.constructor.rfind(c.name + "(Camera*", 0), 0u) << c.constructor;
    EXPECT_TRUE(static_cast<bool>(c.make)) << c.name;
    EXPECT_EQ(FindDetectorClass(c.name), &c);
  }
  EXPECT_FALSE(names.empty());
}

TEST(RegistryTest, CanonRowsSayWhatTheConstructorsTake) {
  const DetectorClass* md = FindDetectorClass("CanonMD");
  const DetectorClass* eid = FindDetectorClass("CanonEID");
  ASSERT_NE(md, nullptr);
  ASSERT_NE(eid, nullptr);
  EXPECT_EQ(md->constructor, "CanonMD(Camera*)");
  EXPECT_EQ(md->fields, 0u);
  EXPECT_EQ(md->kind, DetectorKind::kMotion);
  EXPECT_EQ(eid->constructor, "CanonEID(Camera*, int)");
  EXPECT_EQ(eid->fields, static_cast<unsigned>(kFieldInputs));
  EXPECT_EQ(eid->kind, DetectorKind::kInput);
  EXPECT_EQ(FindDetectorClass("canonmd"), nullptr) << "class names match with their exact case";
}

TEST(RegistryTest, EveryFactoryBuildsADetectorThatBindsAndStops) {
  Camera camera(CameraRecord{});
  CameraAPI api(CameraAPIRecord{});
  for (const DetectorClass& c : DetectorClasses()) {
    DetectorArgs args;
    args.camera = &camera;
    args.api = &api;
    std::unique_ptr<EventDetector> d = c.make(args);
    ASSERT_NE(d, nullptr) << c.name;
    EventBuf buffer;
    EXPECT_EQ(d->Init(&buffer, 0), -1) << c.name;
    EXPECT_EQ(d->Init(&buffer, 500), 0) << c.name;
    EXPECT_FALSE(d->IsStarted()) << c.name;
    EXPECT_EQ(d->Stop(), -2) << c.name;
  }
}

TEST(RegistryTest, EditDistanceIgnoresCase) {
  EXPECT_EQ(EditDistance("CanonMD", "CanonMD"), 0);
  EXPECT_EQ(EditDistance("canonmd", "CanonMD"), 0);
  EXPECT_EQ(EditDistance("CanonM", "CanonMD"), 1);
  EXPECT_EQ(EditDistance("", "abc"), 3);
  EXPECT_EQ(EditDistance("kitten", "sitting"), 3);
  EXPECT_EQ(EditDistance("CanonEDI", "CanonEID"), 1) << "a swap is one edit";
}

TEST(RegistryTest, NearestNameIsTheClosest) {
  EXPECT_EQ(NearestName("CanonEDI", {"CanonMD", "CanonEID"}), "CanonEID");
  EXPECT_EQ(NearestName("xanonMD", {"CanonMD", "CanonEID"}), "CanonMD");
  EXPECT_EQ(NearestName("x", {}), "");
}

TEST(RegistryTest, EveryClassHasAnEmulationAndEveryEmulatedClassIsRegistered) {
  for (const DetectorClass& c : DetectorClasses()) {
    EXPECT_NE(evsim::EmulationForClass(c.name), nullptr) << c.name << " has no camera emulation";
  }
  for (const evsim::Emulation& e : evsim::Emulations()) {
    for (const std::string& cls : e.classes) EXPECT_NE(FindDetectorClass(cls), nullptr) << cls;
    std::set<std::string> covered;
    for (const evsim::DetectorEntry& d : e.detectors) {
      EXPECT_NE(FindDetectorClass(d.cls), nullptr) << d.cls;
      covered.insert(d.cls);
    }
    for (const std::string& cls : e.classes) {
      EXPECT_EQ(covered.count(cls), 1u) << e.maker << " names no detector entry for " << cls;
    }
  }
}

TEST(RegistryTest, ClassesCommandListsEveryRowWithin100Columns) {
  evtest::Completed done = evtest::RunToEnd({evtest::EvwatchPath(), "classes"});
  ASSERT_EQ(done.status, 0);
  EXPECT_TRUE(done.err.empty());
  // One line per class and the heading; how the camera is asked on indented lines below.
  std::vector<std::string> rows;
  std::string how;  // all the indented text, joined
  for (const std::string& line : done.out) {
    EXPECT_LE(line.size(), 100u) << line;
    if (line.rfind("    ", 0) == 0) {
      how += line.substr(4) + " ";
    } else {
      rows.push_back(line);
    }
  }
  ASSERT_EQ(rows.size(), DetectorClasses().size() + 1);
  EXPECT_EQ(rows[0].rfind("CLASS", 0), 0u);
  for (size_t i = 0; i < DetectorClasses().size(); ++i) {
    const DetectorClass& c = DetectorClasses()[i];
    EXPECT_EQ(rows[i + 1].rfind(c.name + " ", 0), 0u) << rows[i + 1];
    EXPECT_NE(rows[i + 1].find(c.maker), std::string::npos) << rows[i + 1];
    EXPECT_NE(how.find(c.how), std::string::npos) << c.how;
  }
}

TEST(RegistryTest, WideClassesShowTheConstructorsOnOneLineEach) {
  evtest::Completed done = evtest::RunToEnd({evtest::EvwatchPath(), "classes", "--wide"});
  ASSERT_EQ(done.status, 0);
  ASSERT_EQ(done.out.size(), DetectorClasses().size() + 1);
  for (size_t i = 0; i < DetectorClasses().size(); ++i) {
    const DetectorClass& c = DetectorClasses()[i];
    const std::string& line = done.out[i + 1];
    EXPECT_EQ(line.rfind(c.name + " ", 0), 0u) << line;
    for (const std::string& part : {c.maker, std::string(KindName(c.kind)), c.constructor, c.how}) {
      EXPECT_NE(line.find(part), std::string::npos) << part << " missing from: " << line;
    }
  }
}

TEST(RegistryTest, ClassesAsJsonForPrograms) {
  evtest::Completed done = evtest::RunToEnd({evtest::EvwatchPath(), "classes", "--format", "json"});
  ASSERT_EQ(done.status, 0);
  std::string text;
  for (const std::string& line : done.out) text += line + "\n";
  nlohmann::json list = nlohmann::json::parse(text, nullptr, false);
  ASSERT_TRUE(list.is_array()) << text;
  ASSERT_EQ(list.size(), DetectorClasses().size());
  for (size_t i = 0; i < list.size(); ++i) {
    const DetectorClass& c = DetectorClasses()[i];
    EXPECT_EQ(list[i]["class"], c.name);
    EXPECT_EQ(list[i]["maker"], c.maker);
    EXPECT_EQ(list[i]["constructor"], c.constructor);
    EXPECT_EQ(list[i]["how"], c.how);
  }
}

}  // namespace
}  // namespace evwatch
