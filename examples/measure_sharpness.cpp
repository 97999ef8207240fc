// The shortest caller: one chart photo in, two MTF50 values out.
#include <qvtester/api.h>

#include <cstdio>

int main(int argc, char** argv) {
  if (argc != 2) {
    std::fprintf(stderr, "usage: measure_sharpness PHOTO\n");
    return 2;
  }
  InitTestModule();
  int code = SetResource(QV_RESOURCE_CHART_PHOTO, argv[1]);
  if (code == QV_SUCCESS) code = RunTest(QV_TEST_CAMERA_AUTOFOCUS, false);
  if (code == QV_SUCCESS) {
    QVResultData* results = nullptr;
    GetResult(&results);
    std::printf("MTF50 vertical %.4f, horizontal %.4f of Nyquist\n", results->af_sfr_scalar1_,
                results->af_sfr_scalar2_);
  } else {
    std::fprintf(stderr, "%s: code %d\n", argv[1], code);
  }
  FinalizeTestModule();
  return code == QV_SUCCESS ? 0 : 1;
}
