#include <gmock/gmock.h>

#include <cstring>
#include <map>
#include <variant>

#include "qvtester/tester.h"

namespace {

using ::testing::ElementsAre;
using ::testing::ElementsAreArray;

QV_PROPERTY_INDEX PropertyIndex(int index) { return static_cast<QV_PROPERTY_INDEX>(index); }

template <typename T>
T Get(QVTester& tester, int index) {
  T value = {};
  EXPECT_EQ(1, tester.GetProperty(PropertyIndex(index), &value)) << "property " << index;
  return value;
}

constexpr std::pair<int, std::variant<int, float>> kScalars[] = {
    {0, 538},   {1, 1440},    {2, 2560},    {6, 4500.0f}, {7, 10},       {8, 12000.0f}, {9, 8.0f},     {10, 25.0f},
    {16, 6},    {17, 200.0f}, {18, 300.0f}, {19, 80.0f},  {26, 5},       {27, 10.0f},   {28, 5000.0f}, {29, 60.0f},
    {30, 1.0f}, {31, 1.0f},   {32, 5},      {33, 10.0f},  {34, 5000.0f}, {35, 60.0f},   {36, 1.0f},    {37, 1.0f},
    {43, 80},   {44, 50},     {45, 80},     {46, 50},     {47, 5000.0f}, {48, 15.0f},   {49, 1.0f},    {50, 3.0f},
    {51, 2.0f}, {53, 0.12f},  {54, 0.7f},   {55, 8},      {56, 8},       {57, 4},       {58, 4},       {59, 10},
    {60, 1},    {61, 50.0f},  {66, 500},    {67, 200},    {68, 3},       {69, 30},      {70, 2.0f},    {71, 4},
    {74, 0},    {75, 0},      {77, 0},      {79, 0.66f},  {80, 5},       {81, 7},       {82, 865},     {83, 558},
    {84, 70},   {85, 70},     {86, 125},    {89, 0},      {90, 3},       {93, 125},     {94, 25}};

TEST(Properties, EveryOneKeepsItsOwnValue) {  // two on one member would overwrite each other
  QVTester tester;
  std::map<int, std::size_t> lengths = {{52, 9}, {62, 9}, {63, 9}, {64, 5}, {65, 5}};
  for (const auto& scalar : kScalars) lengths[scalar.first] = 1;
  std::array<unsigned, 9> value;
  for (const auto& property : lengths) {
    value.fill(1000u + static_cast<unsigned>(property.first));
    ASSERT_EQ(1, tester.SetProperty(PropertyIndex(property.first), value.data()));
  }
  for (const auto& [index, length] : lengths) {
    value.fill(7);
    ASSERT_EQ(1, tester.GetProperty(PropertyIndex(index), value.data()));
    std::vector<unsigned> expected(length, 1000u + static_cast<unsigned>(index));
    expected.resize(9, length == 1 ? 7 : 0);  // zeros behind five coefficients
    EXPECT_THAT(value, ElementsAreArray(expected)) << index;
  }
}

TEST(Properties, DefaultsAreTheCalibratedOnes) {
  QVTester tester;
  for (const auto& scalar : kScalars) {
    std::visit([&](auto value) { EXPECT_EQ(value, Get<decltype(value)>(tester, scalar.first)) << scalar.first; },
               scalar.second);
  }
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
    EXPECT_EQ(-97, tester.SetProperty(PropertyIndex(index), &untouched)) << index;
    EXPECT_EQ(-97, tester.GetProperty(PropertyIndex(index), &untouched)) << index;
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
    ASSERT_TRUE(held != nullptr && held != records);
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
