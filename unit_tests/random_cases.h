#ifndef QVTESTER_UNIT_TESTS_RANDOM_CASES_H_
#define QVTESTER_UNIT_TESTS_RANDOM_CASES_H_

#include <array>
#include <cstdint>
#include <opencv2/core.hpp>
#include <vector>

// Random cases, for tests and fuzzers alike.

/// What a case is made of: a seeded generator's draws in a test, the fuzzer's bytes in a fuzzer.
class Draws {
 public:
  Draws() = default;
  virtual ~Draws() = default;
  Draws(const Draws&) = delete;
  Draws& operator=(const Draws&) = delete;
  virtual int Whole(int low, int high) = 0;  // both included; low when there is nothing left to draw from
  virtual double Real(double low, double high) = 0;
  virtual void Fill(cv::Mat matrix, double low, double high) = 0;  // high is not included
  bool OneIn(int n) { return Whole(1, n) == n; }
  template <typename T, std::size_t n>
  T Pick(const T (&values)[n]) {
    return values[Whole(0, static_cast<int>(n) - 1)];
  }
  /// NaN, infinity, what is hardly a number, and what is no grey level.
  float OddFloat();
};

class SeededDraws : public Draws {
 public:
  explicit SeededDraws(std::uint64_t seed) : random_(seed) {}
  int Whole(int low, int high) override { return random_.uniform(low, high + 1); }
  double Real(double low, double high) override { return random_.uniform(low, high); }
  void Fill(cv::Mat matrix, double low, double high) override { random_.fill(matrix, cv::RNG::UNIFORM, low, high); }

 private:
  cv::RNG random_;
};

/// Dark and light, CV_8UC1: marks, some cut by the border, on paper with specks of any density and grain or among the
/// blocks of a two-dimensional code; or one row of runs near the limits of a mark's ratio. Light is any value but 0.
cv::Mat RandomMarks(Draws& any);
/// The same as a photo of three or four channels, in colours about a threshold of 125.
cv::Mat RandomMarkPhoto(Draws& any);

/// Blurred edges of any slant, direction and polarity, noise, stripes and plain grey, of 8 or 16 bits or floats, with
/// floats of any size among them; part of a larger matrix.
cv::Mat RandomRegion(Draws& any);

/// A high-dynamic-range capture (three floats a pixel, the first of which counts) and what dots to look for.
struct RandomCapture {
  explicit RandomCapture(Draws& any);
  int radius, height, width;
  float threshold;
  std::vector<float> data;
};

/// Pixels of three floats, black ones and odd values among them, and a matrix for them.
struct RandomPixels {
  explicit RandomPixels(Draws& any);
  int rows, cols;
  std::vector<float> triples;
  std::array<float, 9> matrix;
};

/// A picture, a turn of it about the middle of a canvas, and a region of that.
struct RandomTurn {
  explicit RandomTurn(Draws& any);
  cv::Mat image, map;
  cv::Size canvas;
  cv::Rect region;
};

#endif  // QVTESTER_UNIT_TESTS_RANDOM_CASES_H_
