#ifndef QVTESTER_CORE_PROPERTY_TABLE_H_
#define QVTESTER_CORE_PROPERTY_TABLE_H_

#include <array>
#include <iterator>
#include <variant>

#include "qvtester/tester.h"

// Every property in one row: index, member, kind, default. Constructor, setter and getter visit the kind.

// clang-format off
struct IntProperty { int QVTester::*member; int initial; };
struct FloatProperty { float QVTester::*member; float initial; };
struct FloatArray { float (QVTester::*member)[9]; std::array<float, 9> initial; };
struct MatrixProperty { cv::Mat QVTester::*member; int rows, cols; std::array<float, 9> initial; };
struct RegionList { QVRegionList QVTester::*member; int QVTester::*count; };
struct SharedTable { cv::Mat QVTester::*member; int length; };  // ints that stay in the caller's memory
struct PatchValues { float (QVTester::*member)[72]; bool QVTester::*set; };
using PropertyKind = std::variant<IntProperty, FloatProperty, FloatArray, MatrixProperty, RegionList, SharedTable,
                                  PatchValues>;
struct QVProperty { int index; const char* name; PropertyKind kind; };

#define ROW(index, member, kind, ...) QVProperty{index, #member, kind{&QVTester::member, __VA_ARGS__}}
inline constexpr QVProperty kProperties[] = {
    ROW(0, prop_param_0_, IntProperty, 538),
    ROW(1, prop_param_1_, IntProperty, 1440),
    ROW(2, prop_param_2_, IntProperty, 2560),
    ROW(6, prop_param_6_, FloatProperty, 4500.0f),
    ROW(7, prop_param_7_, IntProperty, 10),
    ROW(8, prop_param_8_, FloatProperty, 12000.0f),
    ROW(9, prop_param_9_, FloatProperty, 8.0f),
    ROW(10, prop_param_10_, FloatProperty, 25.0f),
    ROW(16, prop_param_16_, IntProperty, 6),
    ROW(17, prop_param_17_, FloatProperty, 200.0f),
    ROW(18, prop_param_18_, FloatProperty, 300.0f),
    ROW(19, prop_param_19_, FloatProperty, 80.0f),
    ROW(26, prop_param_26_, IntProperty, 5),
    ROW(27, prop_param_27_, FloatProperty, 10.0f),
    ROW(28, prop_param_28_, FloatProperty, 5000.0f),
    ROW(29, prop_param_29_, FloatProperty, 60.0f),
    ROW(30, prop_param_30_, FloatProperty, 1.0f),
    ROW(31, prop_param_31_, FloatProperty, 1.0f),
    ROW(32, prop_param_32_, IntProperty, 5),
    ROW(33, prop_param_33_, FloatProperty, 10.0f),
    ROW(34, prop_param_34_, FloatProperty, 5000.0f),
    ROW(35, prop_param_35_, FloatProperty, 60.0f),
    ROW(36, prop_param_36_, FloatProperty, 1.0f),
    ROW(37, prop_param_37_, FloatProperty, 1.0f),
    ROW(43, prop_param_43_, IntProperty, 80),
    ROW(44, prop_param_44_, IntProperty, 50),
    ROW(45, prop_param_45_, IntProperty, 80),
    ROW(46, prop_param_46_, IntProperty, 50),
    ROW(47, prop_param_47_, FloatProperty, 5000.0f),
    ROW(48, prop_param_48_, FloatProperty, 15.0f),
    ROW(49, prop_param_49_, FloatProperty, 1.0f),
    ROW(50, prop_param_50_, FloatProperty, 3.0f),
    ROW(51, prop_param_51_, FloatProperty, 2.0f),
    ROW(52, prop_color_matrix_, FloatArray,
        {0.34545696f, 0.092805467f, -0.021453569f, 0.17821464f, 0.47477016f, -0.062371522f, 0.23621598f, 0.012985487f,
         1.2785896f}),
    ROW(53, prop_param_53_, FloatProperty, 0.12f),
    ROW(54, prop_param_54_, FloatProperty, 0.7f),
    ROW(55, prop_param_55_, IntProperty, 8),
    ROW(56, prop_param_56_, IntProperty, 8),
    ROW(57, prop_param_57_, IntProperty, 4),
    ROW(58, prop_param_58_, IntProperty, 4),
    ROW(59, prop_param_59_, IntProperty, 10),
    ROW(60, prop_param_60_, IntProperty, 1),
    ROW(61, prop_param_61_, FloatProperty, 50.0f),
    ROW(62, prop_camera_matrix_0_, MatrixProperty, 3, 3,
        {4721.107f, 0.0f, 1023.5f, 0.0f, 4721.107f, 1223.5f, 0.0f, 0.0f, 1.0f}),
    ROW(63, prop_camera_matrix_1_, MatrixProperty, 3, 3,
        {3528.04f, 0.0f, 1023.5f, 0.0f, 3528.04f, 1223.5f, 0.0f, 0.0f, 1.0f}),
    ROW(64, prop_dist_coeffs_0_, MatrixProperty, 5, 1, {-0.192f, 0.8761f, 0.0f, 0.0f, 0.596338f}),
    ROW(65, prop_dist_coeffs_1_, MatrixProperty, 5, 1, {-0.129743f, 0.1889f, 0.0f, 0.0f, 0.194117f}),
    ROW(66, prop_param_66_, IntProperty, 500),
    ROW(67, prop_param_67_, IntProperty, 200),
    ROW(68, prop_param_68_, IntProperty, 3),
    ROW(69, prop_param_69_, IntProperty, 30),
    ROW(70, prop_param_70_, FloatProperty, 2.0f),
    ROW(71, prop_param_71_, IntProperty, 4),
    ROW(74, prop_param_74_, IntProperty, 0),
    ROW(75, prop_region_count_0_, IntProperty, 0),
    ROW(76, prop_region_list_0_, RegionList, &QVTester::prop_region_count_0_),
    ROW(77, prop_region_count_1_, IntProperty, 0),
    ROW(78, prop_region_list_1_, RegionList, &QVTester::prop_region_count_1_),
    ROW(79, prop_param_79_, FloatProperty, 0.66f),
    ROW(80, prop_param_80_, IntProperty, 5),
    ROW(81, prop_param_81_, IntProperty, 7),
    ROW(82, prop_param_82_, IntProperty, 865),
    ROW(83, prop_param_83_, IntProperty, 558),
    ROW(84, prop_param_84_, IntProperty, 70),
    ROW(85, prop_param_85_, IntProperty, 70),
    ROW(86, prop_param_86_, IntProperty, 125),
    ROW(87, prop_table_0_, SharedTable, 256),
    ROW(88, prop_table_1_, SharedTable, 256),
    ROW(89, prop_video_flash_frame_count_, IntProperty, 0),
    ROW(90, prop_param_90_, IntProperty, 3),
    ROW(91, prop_ref_patch_values_1_, PatchValues, &QVTester::ref_patch_values_1_set_),
    ROW(92, prop_ref_patch_values_0_, PatchValues, &QVTester::ref_patch_values_0_set_),
    ROW(93, prop_binary_thr_working_, IntProperty, 125),
    ROW(94, prop_param_94_, IntProperty, 25),
};
#undef ROW
// clang-format on

constexpr bool IndicesAscend() {
  for (std::size_t i = 1; i < std::size(kProperties); ++i) {
    if (kProperties[i].index <= kProperties[i - 1].index) return false;
  }
  return true;
}
static_assert(IndicesAscend(), "one row per index, in order");

#endif  // QVTESTER_CORE_PROPERTY_TABLE_H_
