#include <gtest/gtest.h>

#include <map>
#include <string>

#include "metadata/MetadataContainer.h"

namespace {

class Value : public MetadataObject {
public:
    Value(std::wstring typeName, std::wstring valueText, std::uint32_t elementCount = 1)
        : type(std::move(typeName)), text(std::move(valueText)), count(elementCount) {}
    std::wstring GetValueText() const override { return text; }
    const void* GetValueData(std::uint32_t& state) const override {
        state = 9;
        return &text;
    }
    std::uint32_t GetElementCount() const override { return count; }
    std::wstring GetTypeName() const override { return type; }
    std::int32_t GetTypeCode() const override { return 3; }

private:
    std::wstring type;
    std::wstring text;
    std::uint32_t count;
};

std::wstring Padded(const std::wstring& text, std::size_t width) {
    return text + std::wstring(width - text.size(), L' ');
}

TEST(MetadataObject, LineOfAScalar) {
    EXPECT_EQ(Value(L"float", L"3.5").Format(L"a/b/"),
              Padded(L"a/b/", 80) + L" = (  float        1) = " + Padded(L"3.5", 50) + L"\n");
}

TEST(MetadataObject, LineOfAnArrayKeepsTheColumns) {
    Value value(L"int", L"1,2");
    value.rows = 2;
    value.columns = 3;
    EXPECT_EQ(value.Format(L"x/"),
              Padded(L"x/", 80) + L" = (    int    2,  3) = " + Padded(L"1,2", 50) + L"\n");
}

TEST(MetadataObject, RowsWithoutColumnsAreNoArray) {
    Value value(L"int", L"", 4);
    value.rows = 2;
    EXPECT_FALSE(value.IsArray());
    EXPECT_NE(value.Format(L"x/").find(L"(    int        4)"), std::wstring::npos);
    value.rows = 0;
    value.columns = 3;
    EXPECT_FALSE(value.IsArray());
}

TEST(MetadataObject, DimensionsAreWrittenWhateverTheAnswer) {
    Value value(L"int", L"");
    value.rows = 2;
    std::uint32_t rows = 99;
    std::uint32_t columns = 99;
    EXPECT_FALSE(value.GetArrayDimensions(rows, columns));
    EXPECT_EQ(rows, 2u);
    EXPECT_EQ(columns, 0u);
    value.columns = 5;
    EXPECT_TRUE(value.GetArrayDimensions(rows, columns));
    EXPECT_EQ(columns, 5u);
}

TEST(MetadataObject, LongTextsAreNotCut) {
    const std::wstring name(100, L'n');
    const std::wstring text(70, L't');
    EXPECT_EQ(Value(L"verylongtype", text).Format(name),
              name + L" = (verylongtype        1) = " + text + L"\n");
}

TEST(MetadataObject, ReservedPlacesHaveFixedAnswers) {
    const Value value(L"int", L"");
    EXPECT_EQ(value.ReservedQuery(), 0u);
    EXPECT_FALSE(value.ReservedTest6());
    EXPECT_FALSE(value.ReservedTest29());
}

TEST(MetadataContainer, EmptyOnePrintsNothing) {
    const MetadataContainer container;
    EXPECT_EQ(container.Format(L""), L"");
    EXPECT_EQ(container.Format(L"x/"), L"");
    EXPECT_EQ(container.GetValueText(), L"");
    EXPECT_EQ(container.GetTypeName(), L"container");
    EXPECT_EQ(container.GetTypeCode(), 20);
    EXPECT_EQ(container.GetElementCount(), 1u);
    EXPECT_FALSE(container.IsArray());
    std::uint32_t state = 7;
    EXPECT_EQ(container.GetValueData(state), &container.children);
    EXPECT_EQ(state, 0u);
}

TEST(MetadataContainer, PrintsPathsOfLeavesAndNoLineForItself) {
    MetadataContainer root;
    auto* sub = new MetadataContainer;
    sub->children[L"y"] = new Value(L"float", L"1");
    root.children[L"x"] = sub;
    const std::wstring lines = root.Format(L"");
    EXPECT_EQ(lines, Value(L"float", L"1").Format(L"x/y/"));
}

TEST(MetadataContainer, OrdersByKeyAndJoinsNames) {
    MetadataContainer root;
    for (const wchar_t* key : {L"b", L"a", L"B"}) root.children[key] = new Value(L"int", key);
    EXPECT_EQ(root.GetValueText(), L"B, a, b");
    EXPECT_EQ(root.Format(L"p/"), Value(L"int", L"B").Format(L"p/B/") +
                                      Value(L"int", L"a").Format(L"p/a/") +
                                      Value(L"int", L"b").Format(L"p/b/"));
}

TEST(MetadataContainer, AnEmptyKeyIsAName) {
    MetadataContainer root;
    root.children[L""] = new Value(L"int", L"0");
    root.children[L"a"] = new Value(L"int", L"1");
    EXPECT_EQ(root.GetValueText(), L", a");
}

TEST(MetadataContainer, NullChildrenAreSkipped) {
    MetadataContainer root;
    root.children[L"a"] = nullptr;
    EXPECT_EQ(root.Format(L""), L"");
    EXPECT_EQ(root.GetValueText(), L"a");
}

}  // namespace
