// Companion components and the resource component as the model file
// describes them.
#include <algorithm>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "shared/resource_strings.h"
#include "shared/resource_texts.h"
#include "sim/companions.h"
#include "sim/host_objects.h"
#include "test_sim_support.h"

namespace kpx::sim::test {
namespace {

AutomationError ErrorOf(const std::function<void()>& f) {
  try {
    f();
  } catch (const AutomationError& e) {
    return e;
  }
  return AutomationError(0, "nothing raised");
}

const char* kWorld = R"({
  "model": {"elements": [{"kind": "Class", "name": "CFoo"}]},
  "resources": {"5030": "overridden"},
  "companions": [
    {"progid": "kpxCompProps.API", "clsid": "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}",
     "operations": ["Init", "Terminate", "ShowComponentOptions", "CheckComponent", "Browse"],
     "members": {
       "Init": {"returns": true},
       "CheckComponent": {"raise": {"number": 5, "description": "bad component"}},
       "Browse": {"returns": {"object": "browser"}},
       "Twin": {"returns": {"companion": {"members": {"Go": {"returns": "went"}}}}},
       "Pick": {"returns": {"element": "CFoo"}, "setArgs": [{"keep": true}, "written", {"i2": 7}]}
     },
     "objects": {"browser": {"operations": ["a", "b", "BrowseHeader"], "members": {"BrowseHeader": {"returns": 1}}}}},
    {"progid": "kpxBroken.API", "create": {"error": {"number": -2147221005, "description": "Invalid class string"}}}
  ]
})";

class SimCompanionTest : public ::testing::Test {
 protected:
  SimWorld w{kWorld};
  platform::ObjectFactory& objects() { return w.sim().platform().objects; }
};

TEST_F(SimCompanionTest, UnlistedMembersRaise438AndAreRecorded) {
  ObjectPtr c = objects().CreateObject("kpxcompprops.api");  // ProgIDs ignore case
  EXPECT_EQ(438, ErrorOf([&] { c->IdOfName("Finalize"); }).number());
  // "Terminate" is part of the interface but has no behaviour: the call is
  // made, and fails.
  EXPECT_EQ(438, ErrorOf([&] { CallOwnOperation(c, 2, CallKind::Method, {Variant(1)}); }).number());
  EXPECT_EQ(438, ErrorOf([&] { c->IdOfOwnOperation(6); }).number());
  EXPECT_EQ(438, ErrorOf([&] { c->IdOfOwnOperation(0); }).number());
  const std::vector<EventJson> calls = w.Events("companion-call");
  ASSERT_EQ(4u, calls.size());
  EXPECT_EQ("Finalize", calls[0]["member"]);
  EXPECT_FALSE(calls[0].contains("args"));
  EXPECT_EQ(438, calls[0]["error"]["number"]);
  EXPECT_EQ("Terminate", calls[1]["member"]);
  EXPECT_EQ(2, calls[1]["operation"]);
  EXPECT_EQ(EventJson::array({1}), calls[1]["args"]);
  EXPECT_EQ(6, calls[2]["operation"]);
  EXPECT_EQ("kpxCompProps.API#1", calls[0]["instance"]);
}

TEST_F(SimCompanionTest, MembersRaiseTheirConfiguredErrors) {
  ObjectPtr c = objects().CreateInstance("{cfd996e3-1393-11d3-b9f3-006008bf3acb}", "{IID}");
  const AutomationError e = ErrorOf([&] { CallOwnOperation(c, 4, CallKind::Method, {Variant(c), Variant()}); });
  EXPECT_EQ(5, e.number());
  EXPECT_EQ("bad component", e.description());
  const EventJson call = w.Events("companion-call").at(0);
  EXPECT_EQ("CheckComponent", call["member"]);
  EXPECT_EQ("bad component", call["error"]["description"]);
  EXPECT_FALSE(call.contains("result"));
}

TEST_F(SimCompanionTest, OwnOperationsAreAddressedByPosition) {
  ObjectPtr c = objects().CreateObject("kpxCompProps.API");
  EXPECT_EQ(c->IdOfName("Init"), c->IdOfOwnOperation(1));
  EXPECT_EQ(c->IdOfName("ShowComponentOptions"), c->IdOfOwnOperation(3));
  EXPECT_EQ(Variant(true), CallOwnOperation(c, 1, CallKind::Method));
  // A sub-object is made once per parent and answers by its own positions.
  ObjectPtr browser = CallOwnOperation(c, 5, CallKind::PropertyGet).toObject();
  EXPECT_EQ(browser, CallByName(c, "Browse", CallKind::Method).toObject());
  EXPECT_EQ(Variant(1), CallOwnOperation(browser, 3, CallKind::Method, {Variant(1)}));
  EXPECT_EQ("kpxCompProps.API#1.browser", w.log().Label(browser.get()));
  ObjectPtr twin = CallByName(c, "Twin", CallKind::Method).toObject();
  EXPECT_EQ(Variant("went"), CallByName(twin, "Go", CallKind::Method));
  EXPECT_EQ("kpxCompProps.API#1.Twin", w.log().Label(twin.get()));
}

TEST_F(SimCompanionTest, ByReferenceArgumentsAreWrittenBackOnlyWhereAsked) {
  ObjectPtr c = objects().CreateObject("kpxCompProps.API");
  Variant first("one"), second("two"), third(3);
  const Variant result = CallByName(c, "Pick", CallKind::Method,
                                    {Variant::Ref(&first), Variant::Ref(&second), Variant(third), Variant(4)});
  EXPECT_EQ(Variant("one"), first);  // {"keep": true}
  EXPECT_EQ(Variant("written"), second);
  EXPECT_EQ(Variant(3), third);  // passed by value: nothing to write to
  EXPECT_EQ("element:CFoo", w.log().Label(result.toObject().get()));
  const EventJson call = w.Events("companion-call").at(0);
  EXPECT_EQ((EventJson{{"byref", "one"}}), call["args"][0]);
  EXPECT_EQ((EventJson{{"2", "written"}}), call["byref"]);
  EXPECT_EQ((EventJson{{"object", "element:CFoo"}}), call["result"]);
}

TEST_F(SimCompanionTest, EachCreationIsANewInstanceAndFailuresAreRecorded) {
  ObjectPtr a = objects().CreateObject("kpxCompProps.API");
  ObjectPtr b = objects().CreateObject("kpxCompProps.API");
  EXPECT_NE(a, b);
  EXPECT_EQ("kpxCompProps.API#2", w.log().Label(b.get()));
  const AutomationError broken = ErrorOf([&] { objects().CreateObject("kpxBroken.API"); });
  EXPECT_EQ(-2147221005, broken.number());
  EXPECT_EQ(429, ErrorOf([&] { objects().CreateObject("kpxNowhere.API"); }).number());
  EXPECT_EQ(429, ErrorOf([&] { objects().CreateInstance("{00000000-0000-0000-0000-000000000000}", ""); }).number());
  const std::vector<EventJson> created = w.Events("object-create");
  ASSERT_EQ(5u, created.size());
  EXPECT_TRUE(created[1]["ok"].get<bool>());
  EXPECT_FALSE(created[2]["ok"].get<bool>());
  EXPECT_EQ("Invalid class string", created[2]["error"]["description"]);
  EXPECT_FALSE(created[2].contains("instance"));
  EXPECT_EQ("{00000000-0000-0000-0000-000000000000}", created[4]["clsid"]);
}

// Counts the calls it is told of and how deep they nest.
struct Spans final : CallObserver {
  int entered = 0, left = 0, depth = 0, deepest = 0;
  void Enter() override {
    ++entered;
    deepest = std::max(deepest, ++depth);
  }
  void Leave() override {
    ++left;
    --depth;
  }
};

TEST_F(SimCompanionTest, AnObserverIsToldOfEveryCallIntoHostObjectsAndCompanionsRaisingOrNot) {
  Spans spans;
  w.log().Observe(&spans);
  ObjectPtr app = w.world().application();
  CallByName(app, "CurrentModel", CallKind::PropertyGet);  // the name, then the call
  EXPECT_EQ(2, spans.entered);
  ObjectPtr c = objects().CreateObject("kpxCompProps.API");
  EXPECT_EQ(2, spans.entered);  // a creation is no call into the object
  // By position: the operation's name is looked up inside the first call.
  EXPECT_EQ(5, ErrorOf([&] { CallOwnOperation(c, 4, CallKind::Method, {Variant(c), Variant()}); }).number());
  EXPECT_EQ(438, ErrorOf([&] { c->IdOfName("Finalize"); }).number());
  EXPECT_EQ(438, ErrorOf([&] { app->Invoke(999, CallKind::Method, {}); }).number());
  EXPECT_EQ(7, spans.entered);
  EXPECT_EQ(spans.entered, spans.left);
  EXPECT_EQ(0, spans.depth);
  EXPECT_EQ(2, spans.deepest);
  w.log().Observe(nullptr);
  CallByName(app, "CurrentModel", CallKind::PropertyGet);
  EXPECT_EQ(7, spans.entered);
}

TEST_F(SimCompanionTest, ResourceTextsComeFromTheModelFirstAndAreNotRecorded) {
  ObjectPtr byId = objects().CreateInstance(kResourceClassId, kResourceInterfaceId);
  ObjectPtr byName = objects().CreateObject(kResourceProgId);
  EXPECT_EQ("overridden", CallOwnOperation(byId, 1, CallKind::Method, {Variant(5030)}).toString());
  Variant idArg(5001);
  EXPECT_EQ(Variant(FindResourceText(5001)), CallByName(byName, "GetString", CallKind::Method, {Variant::Ref(&idArg)}));
  const AutomationError missing = ErrorOf([&] { CallOwnOperation(byId, 1, CallKind::Method, {Variant(4)}); });
  EXPECT_EQ(326, missing.number());
  EXPECT_EQ("Resource with identifier '4' not found", missing.description());
  EXPECT_TRUE(w.Events("companion-call").empty());
  const std::vector<EventJson> created = w.Events("object-create");
  ASSERT_EQ(2u, created.size());
  EXPECT_EQ("kpxres.KPXResourceInterface#2", created[1]["instance"]);
}

// A member whose answer depends on its arguments: a component check that
// passes one component and fails another.
const char* kAnsweringWorld = R"({
  "model": {"elements": [{"kind": "Module", "name": "GoodLib"}, {"kind": "Module", "name": "BadLib"},
                         {"kind": "Module", "name": "OddLib"}, {"kind": "Module", "name": "OtherLib"}]},
  "companions": [
    {"clsid": "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}",
     "operations": ["Init", "Terminate", "ShowComponentOptions", "CheckComponent"],
     "members": {
       "CheckComponent": {
         "returns": true,
         "answers": [
           {"args": [{"element": "GoodLib"}], "returns": true},
           {"args": [{"element": "BadLib"}], "returns": false},
           {"args": [{"element": "BadLib"}], "returns": "never reached"},
           {"args": [{"element": "OddLib"}, {"i2": 2}], "raise": {"number": 5, "description": "odd"}},
           {"args": [{"element": "OddLib"}, "x"]}
         ]},
       "Count": {"answers": [{"args": [1], "returns": "one"}], "raise": {"number": 13}}
     }}
  ]
})";

class SimAnswerTest : public ::testing::Test {
 protected:
  SimWorld w{kAnsweringWorld};
  ObjectPtr companion = w.sim().platform().objects.CreateInstance("{CFD996E3-1393-11D3-B9F3-006008BF3ACB}", "");
  Variant Element(const char* key) { return Variant(ObjectPtr(w.world().FindElement(key))); }
  Variant Check(std::initializer_list<Variant> args) {
    return CallOwnOperation(companion, 4, CallKind::Method, args);
  }
};

TEST_F(SimAnswerTest, TheFirstAnswerWhoseArgumentsMatchDecides) {
  EXPECT_EQ(Variant(true), Check({Element("GoodLib"), Variant()}));
  EXPECT_EQ(Variant(false), Check({Element("BadLib"), Variant()}));  // not the later "never reached"
  // Unmatched arguments fall back to the member's own answer.
  EXPECT_EQ(Variant(true), Check({Element("OtherLib"), Variant()}));
  const std::vector<EventJson> calls = w.Events("companion-call");
  ASSERT_EQ(3u, calls.size());
  EXPECT_EQ(false, calls[1]["result"]);
  EXPECT_EQ((EventJson::array({{{"object", "element:BadLib"}}, nullptr})), calls[1]["args"]);
}

TEST_F(SimAnswerTest, AnswersCompareEveryLeadingArgumentByTypeAndValue) {
  Variant odd = Element("OddLib");
  // A by-reference argument matches by what it refers to.
  const AutomationError e = ErrorOf([&] { Check({Variant::Ref(&odd), Variant(int16_t{2})}); });
  EXPECT_EQ(5, e.number());
  EXPECT_EQ("odd", e.description());
  EXPECT_EQ(Variant(true), Check({odd, Variant(2)}));  // a Long is not an Integer
  EXPECT_EQ(Variant(true), Check({odd}));              // too few arguments to match
  // An answer without "returns" or "raise" answers Empty.
  EXPECT_TRUE(Check({odd, Variant("x"), Variant(9)}).isEmpty());
  const std::vector<EventJson> calls = w.Events("companion-call");
  ASSERT_EQ(4u, calls.size());
  EXPECT_EQ(5, calls[0]["error"]["number"]);
  EXPECT_EQ(nullptr, calls[3]["result"]);
}

TEST_F(SimAnswerTest, AnAnswerOverridesTheMembersRaise) {
  EXPECT_EQ(Variant("one"), CallByName(companion, "Count", CallKind::Method, {Variant(1)}));
  EXPECT_EQ(13, ErrorOf([&] { CallByName(companion, "Count", CallKind::Method, {Variant(2)}); }).number());
}

TEST(SimAnswerInput, FaultsInAnswersNameTheirLines) {
  auto load = [](const std::string& answer) {
    std::string message;
    const int line = FaultLine(
        [&] {
          ParseModel(R"({"model": {"elements": [{"kind": "Module", "name": "GoodLib"}]},
"companions": [{"progid": "p", "members": {"M": {"answers": [
)" + answer + "]}}}]}");
        },
        &message);
    return std::make_pair(line, message);
  };
  EXPECT_EQ(3, load(R"({"args": [{"element": "GoodLib"}], "returns": 1, "raise": {"number": 5}})").first);
  EXPECT_EQ(3, load(R"({"args": [{"element": "NoSuchLib"}], "returns": 1})").first);
  EXPECT_EQ(3, load(R"({"returns": 1})").first);  // "args" is required
  EXPECT_EQ(3, load(R"({"args": [], "result": 1})").first);
  EXPECT_EQ(3, load(R"({"args": {"element": "GoodLib"}})").first);
  const auto [line, message] = load(R"({"args": [{"byref": 1}]})");
  EXPECT_EQ(3, line) << message;
  EXPECT_EQ(-1, load(R"({"args": [{"element": "GoodLib"}, null], "returns": {"i2": 1}, "comment": "ok"})").first);
}

TEST(SimResourceComponent, AnUnregisteredComponentFailsBothWays) {
  SimWorld w(R"({"resourceComponent": {"registered": false}})");
  platform::ObjectFactory& objects = w.sim().platform().objects;
  EXPECT_EQ(429, ErrorOf([&] { objects.CreateInstance(kResourceClassId, kResourceInterfaceId); }).number());
  EXPECT_EQ(429, ErrorOf([&] { objects.CreateObject(kResourceProgId); }).number());
}

}  // namespace
}  // namespace kpx::sim::test
