// The tree node record that every builder fills: encoded text and tip, optional members, flags.
#include <gtest/gtest.h>

#include "src/handler/HarmonaHandler.h"

namespace {

class TreeNode : public ::testing::Test {
  protected:
    HarmonaHandler handler;
    Json::Value node;
};

TEST_F(TreeNode, AmpersandOrAngleBracketIsStoredEncodedInTextAndQtip) {
    handler.FillTreeNode(node, "id", "pid", "Rock & <Roll>", "icon.png", 0);
    EXPECT_EQ(node["text"], "Rock &amp; &lt;Roll&gt;");
    EXPECT_EQ(node["qtip"], "Rock &amp; &lt;Roll&gt;");
}

TEST_F(TreeNode, EmptyPidOrIconIsLeftOutButEmptyIdIsWritten) {
    handler.FillTreeNode(node, "", "", "t", "", 0);
    EXPECT_FALSE(node.isMember("pid"));
    EXPECT_FALSE(node.isMember("icon"));
    ASSERT_TRUE(node.isMember("id"));
    EXPECT_EQ(node["id"], "");
    handler.FillTreeNode(node, "x", "p", "t", "i.png", 0);
    EXPECT_EQ(node["pid"], "p");
    EXPECT_EQ(node["icon"], "i.png");
}

TEST_F(TreeNode, FlagsZeroWriteAllFiveBooleansFalse) {
    handler.FillTreeNode(node, "x", "", "t", "", 0);
    for (const char* name : {"allowDrag", "allowDrop", "draggable", "expanded", "leaf"}) {
        ASSERT_TRUE(node[name].isBool()) << name;
        EXPECT_FALSE(node[name].asBool()) << name;
    }
    EXPECT_EQ(node.size(), 8u);  // text, qtip, id and the five booleans
}

TEST_F(TreeNode, Flags24WriteExpandedAndLeafOnly) {
    handler.FillTreeNode(node, "x", "", "t", "", NODE_EXPANDED | NODE_LEAF);
    EXPECT_EQ(node["expanded"], true);
    EXPECT_EQ(node["leaf"], true);
    EXPECT_EQ(node["allowDrag"], false);
    EXPECT_EQ(node["allowDrop"], false);
    EXPECT_EQ(node["draggable"], false);
}

TEST_F(TreeNode, EachFlagBitSetsItsAttribute) {
    const std::pair<unsigned, const char*> bits[] = {{NODE_ALLOW_DRAG, "allowDrag"},
                                                     {NODE_ALLOW_DROP, "allowDrop"},
                                                     {NODE_DRAGGABLE, "draggable"},
                                                     {NODE_EXPANDED, "expanded"},
                                                     {NODE_LEAF, "leaf"}};
    for (const auto& [bit, name] : bits) {
        handler.FillTreeNode(node, "x", "", "t", "", bit);
        for (const auto& [other, otherName] : bits)
            EXPECT_EQ(node[otherName].asBool(), other == bit) << name;
    }
}

TEST_F(TreeNode, BitsAbove16AreIgnored) {
    handler.FillTreeNode(node, "x", "", "t", "", 32u | 64u | 0x80000000u);
    for (const char* name : {"allowDrag", "allowDrop", "draggable", "expanded", "leaf"})
        EXPECT_FALSE(node[name].asBool());
    EXPECT_EQ(node.size(), 8u);
}

TEST_F(TreeNode, SecondCallLeavesOnlyTheSecondNodesAttributes) {
    handler.FillTreeNode(node, "first", "parent", "One", "one.png", 31);
    node["children"] = Json::Value(Json::arrayValue);
    node["iconCls"] = "x-tree-hide-icon";
    handler.FillTreeNode(node, "second", "", "Two", "", 0);
    EXPECT_FALSE(node.isMember("pid"));
    EXPECT_FALSE(node.isMember("icon"));
    EXPECT_FALSE(node.isMember("children"));
    EXPECT_FALSE(node.isMember("iconCls"));
    EXPECT_EQ(node["id"], "second");
    EXPECT_EQ(node["text"], "Two");
    EXPECT_EQ(node["leaf"], false);
}

TEST_F(TreeNode, QtipIsACopyOfTheStoredText) {
    handler.FillTreeNode(node, "x", "", "\"quoted\" 'single'", "", 0);
    EXPECT_EQ(node["text"], "&quot;quoted&quot; &#39;single&#39;");
    EXPECT_EQ(node["qtip"], node["text"]);
}

TEST_F(TreeNode, ReusedScalarValueBecomesAnObject) {
    node = "not an object";
    handler.FillTreeNode(node, "x", "", "t", "", 0);
    EXPECT_TRUE(node.isObject());
    EXPECT_EQ(node["id"], "x");
}

}  // namespace
