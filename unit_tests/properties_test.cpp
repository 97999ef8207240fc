#include <gmock/gmock.h>

#include <cstring>
#include <map>

#include "core/property_table.h"
#include "qvtester/tester.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;

QV_PROPERTY_INDEX Index(int index) { return static_cast<QV_PROPERTY_INDEX>(index); }

template <typename T>
T Get(QVTester& tester, int index) {
  T value = {};
  EXPECT_EQ(1, tester.GetProperty(Index(index), &value)) << "property " << index;
  return value;
}

bool IsScalar(const QVProperty& property) {
  return std::holds_alternative<IntProperty>(property.kind) || std::holds_alternative<FloatProperty>(property.kind);
}

TEST(Properties, EveryOneKeepsItsOwnValue) {
  QVTester tester;
  for (const QVProperty& property : kProperties) {  // two rows on one member would overwrite each other
    std::array<std::uint32_t, 9> value;
    value.fill(1000u + static_cast<unsigned>(property.index));
    if (!std::holds_alternative<RegionList>(property.kind) && !std::holds_alternative<SharedTable>(property.kind) &&
        !std::holds_alternative<PatchValues>(property.kind)) {
      ASSERT_EQ(1, tester.SetProperty(Index(property.index), value.data()));
    }
  }
  for (const QVProperty& property : kProperties) {
    if (!IsScalar(property)) continue;
    EXPECT_EQ(1000u + static_cast<unsigned>(property.index), Get<std::uint32_t>(tester, property.index));
  }
  std::uint32_t nine[9];
  for (const int index : {52, 62, 63}) {
    tester.GetProperty(Index(index), nine);
    EXPECT_THAT(nine, Each(1000u + static_cast<unsigned>(index)));
  }
  for (const unsigned index : {64u, 65u}) {  // five coefficients, and zeros behind them
    const unsigned own = 1000 + index;
    tester.GetProperty(Index(static_cast<int>(index)), nine);
    EXPECT_THAT(nine, ElementsAre(own, own, own, own, own, 0, 0, 0, 0));
  }
}

TEST(Properties, DefaultsAreTheCalibratedOnes) {
  QVTester tester;
  const std::map<int, int> kInts = {{0, 538}, {1, 1440}, {2, 2560}, {7, 10},   {16, 6},   {26, 5},  {32, 5},  {43, 80},
                                    {44, 50}, {45, 80},  {46, 50},  {55, 8},   {56, 8},   {57, 4},  {58, 4},  {59, 10},
                                    {60, 1},  {66, 500}, {67, 200}, {68, 3},   {69, 30},  {71, 4},  {74, 0},  {75, 0},
                                    {77, 0},  {80, 5},   {81, 7},   {82, 865}, {83, 558}, {84, 70}, {85, 70}, {86, 125},
                                    {89, 0},  {90, 3},   {93, 125}, {94, 25}};
  const std::map<int, float> kFloats = {
      {6, 4500.0f}, {8, 12000.0f}, {9, 8.0f},   {10, 25.0f},   {17, 200.0f}, {18, 300.0f}, {19, 80.0f},
      {27, 10.0f},  {28, 5000.0f}, {29, 60.0f}, {30, 1.0f},    {31, 1.0f},   {33, 10.0f},  {34, 5000.0f},
      {35, 60.0f},  {36, 1.0f},    {37, 1.0f},  {47, 5000.0f}, {48, 15.0f},  {49, 1.0f},   {50, 3.0f},
      {51, 2.0f},   {53, 0.12f},   {54, 0.7f},  {61, 50.0f},   {70, 2.0f},   {79, 0.66f}};
  for (const auto& [index, value] : kInts) EXPECT_EQ(value, Get<int>(tester, index)) << index;
  for (const auto& [index, value] : kFloats) EXPECT_EQ(value, Get<float>(tester, index)) << index;
  using Nine = std::array<float, 9>;
  EXPECT_THAT(Get<Nine>(tester, 52), ElementsAre(0.34545696f, 0.092805467f, -0.021453569f, 0.17821464f, 0.47477016f,
                                                 -0.062371522f, 0.23621598f, 0.012985487f, 1.2785896f));
  EXPECT_THAT(Get<Nine>(tester, 62), ElementsAre(4721.107f, 0, 1023.5f, 0, 4721.107f, 1223.5f, 0, 0, 1));
  EXPECT_THAT(Get<Nine>(tester, 63), ElementsAre(3528.04f, 0, 1023.5f, 0, 3528.04f, 1223.5f, 0, 0, 1));
  EXPECT_THAT(Get<Nine>(tester, 64), ElementsAre(-0.192f, 0.8761f, 0, 0, 0.596338f, 0, 0, 0, 0));
  EXPECT_THAT(Get<Nine>(tester, 65), ElementsAre(-0.129743f, 0.1889f, 0, 0, 0.194117f, 0, 0, 0, 0));
}

TEST(Properties, UnknownIndicesChangeNothing) {
  QVTester tester;
  int untouched = 77;
  for (const int index : {-1, 3, 5, 11, 15, 20, 25, 38, 42, 72, 73, 95, 1 << 30}) {
    EXPECT_EQ(-97, tester.SetProperty(Index(index), &untouched)) << index;
    EXPECT_EQ(-97, tester.GetProperty(Index(index), &untouched)) << index;
  }
  EXPECT_EQ(77, untouched);
}

TEST(Properties, RegionListsAreCopiedByTheirCount) {
  QVTester tester;
  EXPECT_EQ(nullptr, Get<QVRegionRecord*>(tester, 76));
  QVRegionRecord records[2] = {{{1, 2, 3, 4, 5}}, {{6, 7, 8, 9, 10}}};
  for (int count : {2, 1, 0}) {
    ASSERT_EQ(1, tester.SetProperty(QV_PROPERTY_REGION_COUNT_0, &count));
    ASSERT_EQ(1, tester.SetProperty(QV_PROPERTY_REGION_LIST_0, records));
    auto* held = Get<QVRegionRecord*>(tester, 76);
    ASSERT_NE(nullptr, held);
    EXPECT_NE(records, held);
    EXPECT_EQ(0, std::memcmp(held, records, sizeof(QVRegionRecord) * static_cast<std::size_t>(count)));
  }
  int negative = -1;
  auto* before = Get<QVRegionRecord*>(tester, 76);
  ASSERT_EQ(1, tester.SetProperty(QV_PROPERTY_REGION_COUNT_0, &negative));
  EXPECT_EQ(-97, tester.SetProperty(QV_PROPERTY_REGION_LIST_0, records));
  EXPECT_EQ(before, Get<QVRegionRecord*>(tester, 76));
  EXPECT_EQ(nullptr, Get<QVRegionRecord*>(tester, 78)) << "the other list is its own";
}

}  // namespace
