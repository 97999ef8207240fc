#include "unit_tests/random_cases.h"

#include <algorithm>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "unit_tests/drawing.h"

namespace {

cv::Mat MarksAmongSpecks(Draws& any) {
  const int module = any.Whole(1, 8);
  const int share = any.Whole(0, 100);
  const int dark = any.Pick({0, 2, 50, share});  // specks, in percent
  const int grain = dark == 50 ? module : any.Whole(1, 3);
  const int width = any.OneIn(3) ? 64 * any.Whole(1, 3) : any.Whole(1, 30) * module;
  cv::Mat image(any.Whole(1, 30) * module / grain + 1, width / grain + 1, CV_8UC1);
  any.Fill(image, 0, 100);
  cv::resize(image >= dark, image, {}, grain, grain, cv::INTER_NEAREST);
  const int margin = 7 * (module + 1);
  cv::Mat canvas;
  cv::copyMakeBorder(image, canvas, margin, margin, margin, margin, cv::BORDER_CONSTANT);
  for (int marks = any.Whole(0, 6); marks > 0; --marks) {
    const int row = any.Whole(margin / 2, image.rows + margin / 2 - 1);
    const int column = any.Whole(margin / 2, image.cols + margin / 2 - 1);
    DrawMark(canvas, row, column, std::max(1, module + any.Whole(-1, 1)));
  }
  return canvas({margin, margin, std::min(width, image.cols), image.rows}).clone();
}

cv::Mat RunsNearTheLimits(Draws& any) {
  std::vector<uchar> row(any.Whole(0, 3), 255);
  const int total = any.Whole(7, 90);
  for (int run = 0; run < 18; ++run) {
    const int modules = run % 6 == 2 ? 3 : 1;
    const int ideal = modules * total * any.Whole(1, 3) / 14;
    row.insert(row.end(), std::max(row.empty() ? 1 : 0, ideal + any.Whole(-1, 1)),
               row.empty() || row.back() != 0 ? 0 : 255);
  }
  return cv::repeat(cv::Mat(row).reshape(1, 1), 3, 1);
}

}  // namespace

float Draws::OddFloat() {
  return Pick(
      {0.0f, -0.0f, NAN, INFINITY, -INFINITY, 1e38f, 3e38f, -3e38f, 1e-38f, 1e-45f, -1.0f, 255.5f, 256.0f, 8388609.0f});
}

cv::Mat RandomMarks(Draws& any) {
  cv::Mat image = any.OneIn(3) ? RunsNearTheLimits(any) : MarksAmongSpecks(any);
  if (any.OneIn(2)) return image;
  // In a wider picture of other pixels, and with any value but 0 for light.
  cv::Mat around = cv::Mat::zeros(image.rows + 3, image.cols + any.Whole(1, 70), CV_8UC1);
  cv::Mat view = around({{any.Whole(0, around.cols - image.cols), 2}, image.size()});
  any.Fill(view, 1, 256);
  view &= image;
  return view;
}

cv::Mat RandomMarkPhoto(Draws& any) {
  const cv::Mat marks = RandomMarks(any);
  cv::Mat photo(marks.size(), any.OneIn(4) ? CV_8UC4 : CV_8UC3);
  cv::Mat dark(photo.size(), photo.type());
  any.Fill(photo, 150, 256);
  any.Fill(dark, 0, 100);
  dark.copyTo(photo, marks == 0);
  return photo;
}

cv::Mat RandomRegion(Draws& any) {
  const bool large = any.OneIn(10);
  cv::Mat_<float> region(cv::Size{any.Whole(1, large ? 180 : 60), any.Whole(1, large ? 400 : 60)});
  const double noise = any.OneIn(3) ? 0 : any.Real(0, 100);
  any.Fill(region, -noise, noise + 1e-9);
  const double slope = any.OneIn(4) ? 0 : any.Real(-0.6, 0.6);
  const double place = region.cols * any.Real(0.2, 0.8);
  const double blur = any.Real(0.1, 6);
  const double level = any.Real(0, 255);
  const int kind = any.Whole(0, 7);
  const double step = kind == 0 ? 0 : any.Real(0, 255) - level;
  region.forEach([&](float& value, const int* at) {
    value += static_cast<float>(level + step * std::clamp((at[1] - place - slope * at[0]) / blur + 0.5, 0.0, 1.0));
  });
  if (kind == 1) cv::repeat(region.row(0).clone(), region.rows, 1, region);
  if (any.OneIn(2)) region = region.t();
  cv::Mat stored = region;
  if (any.OneIn(3)) {
    stored = region * std::pow(10, any.Real(-44, 36));
  } else {
    region.convertTo(stored, any.OneIn(7) ? CV_16U : CV_8U, 1);
    if (any.OneIn(2)) stored.convertTo(stored, CV_32F, any.OneIn(9) ? 200 : 1);
    for (int odd = stored.depth() == CV_32F ? any.Whole(0, 2) : 0; odd > 0; --odd) {
      const int row = any.Whole(0, stored.rows - 1);
      stored.at<float>(row, any.Whole(0, stored.cols - 1)) = any.OddFloat();
    }
  }
  cv::copyMakeBorder(stored, stored, 1, 2, 2, 3, cv::BORDER_CONSTANT, any.Whole(0, 255));
  return stored(cv::Rect(2, 1, stored.cols - 5, stored.rows - 3));
}

RandomCapture::RandomCapture(Draws& any)
    : radius(any.Whole(0, 6)), height(2 * radius + any.Whole(1, 24)), width(2 * radius + any.Whole(1, 150)) {
  // From the smallest to the largest, so that every guard of the undivided test is met.
  const float level = any.Pick({0.0f, 1e-45f, 1e-38f, 3e-37f, 1e-6f, 1.0f, 100.0f, 1e6f, 1e30f, 3e38f});
  const float spread = std::ldexp(1.0f, -any.Whole(0, 23));
  cv::Mat factors(1, height * width, CV_32F);
  any.Fill(factors, 1, 1 + spread);
  data.assign(3 * factors.total(), NAN);  // the other channels must not matter
  for (int i = 0; i < factors.cols; ++i) data[3 * i] = level * factors.at<float>(i);
  const float other = any.OneIn(2) ? any.OddFloat() : 2 * level;
  for (int n = any.Whole(0, 3); n > 0; --n) data[3 * any.Whole(0, factors.cols - 1)] = other;
  const float odd = any.OddFloat();
  threshold = any.OneIn(2) ? spread : any.Pick({-1.0f, 1e-7f, 1.1e-6f, 0.01f, 0.1f, 0.5f, 1.0f, 3.0f, 10.0f, odd});
}

RandomPixels::RandomPixels(Draws& any) : rows(any.Whole(1, 20)), cols(any.Whole(0, 39)) {
  const bool negative = any.OneIn(4);  // all of them, so that quotients are as of a picture
  const double low = negative ? -1 : -0.1;
  const double high = negative ? -0.1 : 1;
  const int values = 3 * rows * cols;
  triples.assign(values, any.OneIn(2) ? -0.0f : 0.0f);  // black, and then some are not
  if (values > 0) any.Fill(cv::Mat(triples).rowRange(any.Whole(0, values - 1), values), low, high);
  for (int n = values > 0 ? any.Whole(0, 7) : 0; n > 0; --n) triples[any.Whole(0, values - 1)] = any.OddFloat();
  for (float& value : matrix) value = static_cast<float>(any.Real(low, high));
}

RandomTurn::RandomTurn(Draws& any)
    : image(cv::Size{any.Whole(1, 80), any.Whole(1, 60)}, any.OneIn(3) ? CV_8UC3 : CV_8UC1),
      canvas{any.Whole(1, 90), any.Whole(1, 90)} {
  const double degrees = any.OneIn(2) ? any.Whole(0, 359) : any.Real(-720, 720);
  map = cv::getRotationMatrix2D({static_cast<float>(canvas.width) * 0.5f, static_cast<float>(canvas.height) * 0.5f},
                                degrees, any.OneIn(3) ? any.Real(0.1, 8) : 1);
  region.x = any.Whole(0, canvas.width - 1);
  region.y = any.Whole(0, canvas.height - 1);
  region.width = any.Whole(0, canvas.width - region.x);
  region.height = any.Whole(0, canvas.height - region.y);
  any.Fill(image, 0, 256);
}
