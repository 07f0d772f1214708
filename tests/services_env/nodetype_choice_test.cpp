// The node type an upgraded instance is created with follows the templates
// the current copy ships.
#include "NT/nodetypechoice.h"
#include "services_world.h"

#include <gtest/gtest.h>

namespace kxltest {
namespace {

class NodeTypeChoiceTest : public ServicesWorld {
protected:
  int32_t choose(uint32_t requested) { return chooseNodeType(context, *options, requested); }

  UpgradeContext context;
  std::unique_ptr<UpgradeOptions> options = makeOptions();
};

TEST_F(NodeTypeChoiceTest, RequestedTypeWinsWhenItsTemplateExists) {
  addTemplate(3);
  addTemplate(4);
  EXPECT_EQ(3, choose(3));
  EXPECT_EQ(4, choose(4));
}

TEST_F(NodeTypeChoiceTest, FallbackFollowsTheFixedOrder) {
  addTemplate(5);
  addTemplate(2);
  EXPECT_EQ(5, choose(4));
  addTemplate(3);
  EXPECT_EQ(3, choose(4));
  addTemplate(1);
  EXPECT_EQ(1, choose(4));
  EXPECT_EQ(1, choose(7)); // no template for a type outside 1 to 5
}

TEST_F(NodeTypeChoiceTest, NoTemplateAtAllGivesTheRequestedTypeWithTracePoint10) {
  startTrace();
  EXPECT_EQ(4, choose(4));
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780522 probe=10"));
  makeDirectories(std::string(kCurrentPath) + "\\CFG");
  EXPECT_EQ(2, choose(2));
}

} // namespace
} // namespace kxltest
