// Slot 36: a list of image files, registered onto the first, binarised, and taken apart into principal components.

#include <algorithm>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "chart/image_list.h"
#include "chart/registration.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

// A grey, smoothed picture, as stored; empty when the file can't be read, with one line in the log.
cv::Mat ReadGray(const std::string& path) {
  std::vector<unsigned char> bytes;
  std::string reason;
  cv::Mat image;
  if (QVResource::ReadPicture(path.c_str(), bytes, reason)) {
    image = QVResource::DecodePicture(bytes, reason, cv::IMREAD_GRAYSCALE);
  }
  if (image.empty()) {
    QVDEBUGP("[%s] %s: %s", "SetResource", path.c_str(), reason.c_str());
    return image;
  }
  cv::medianBlur(image, image, kMedianAperture);
  return image;
}

// Light and dark about the picture's own mean, as one row of floats.
void BinariseInto(const cv::Mat& image, cv::Mat row) {
  cv::Mat binary;
  cv::threshold(image, binary, cv::mean(image)[0], 255, cv::THRESH_BINARY);
  binary.reshape(1, 1).convertTo(row, CV_32F);
}

}  // namespace

int QVTester::SetResource(QV_RESOURCE_INDEX index, std::vector<std::string> paths) {
  if (index != QV_RESOURCE_IMAGE_LIST || paths.empty()) return QV_ERROR_INVALID_ARGUMENT;
  ImageList list;
  for (const std::string& path : paths) {
    const cv::Mat image = ReadGray(path);
    if (image.empty()) return QV_ERROR_INVALID_ARGUMENT;
    list.gray.push_back(image);
  }

  const cv::Mat& first = list.gray.front();
  const int count = static_cast<int>(list.gray.size());
  list.matrix = cv::Mat::zeros(count, static_cast<int>(first.total()), CV_32F);
  list.registered.push_back(first);
  BinariseInto(first, list.matrix.row(0));
  if (count > 1) {
    const FeatureImage reference = FindFeatures(first);
    for (int i = 1; i < count; ++i) {
      const Registration found = Register(reference, FindFeatures(list.gray[i]));
      if (found.matrix.empty()) {
        QVDEBUGP("[%s] %s: too few features match the first image", "SetResource", paths[i].c_str());
        return QV_ERROR_NO_REGISTRATION;
      }
      list.registered.push_back(found.unwarped);
      BinariseInto(found.unwarped, list.matrix.row(i));
    }
  }

  cv::Mat sum = cv::Mat::zeros(first.size(), CV_32F);
  for (const cv::Mat& image : list.registered) cv::add(sum, image, sum, cv::noArray(), CV_32F);
  sum.convertTo(list.combined, CV_8U, 1.0 / count);

  const cv::PCA analysis(list.matrix, cv::Mat(), cv::PCA::DATA_AS_ROW, 0);
  list.mean = analysis.mean;
  list.eigenvectors = analysis.eigenvectors;
  list.eigenvalues = analysis.eigenvalues;
  list.projection = analysis.project(list.matrix);
  list.components = std::clamp(prop_param_80_, 1, count);

  if (resources_[index] == nullptr) resources_[index] = std::make_unique<QVResource>();
  kept_->image_list = std::move(list);
  return QV_SUCCESS;
}

int UsableComponents(const QVTester::ImageList& list, int wanted) {
  // As many images span one direction less than their number: the last component's is rounding alone.
  constexpr float kNothing = 1e-6f;
  int components = 0;
  while (components < std::min(wanted, list.eigenvectors.rows) &&
         list.eigenvalues.at<float>(components) > kNothing * list.eigenvalues.at<float>(0)) {
    ++components;
  }
  return components;
}

cv::Mat QVTester::RebuildListImage(int i) {
  const ImageList& list = kept_->image_list;
  if (i < 0 || i >= list.projection.rows) CV_Error_(cv::Error::StsOutOfRange, ("the list holds no image %d", i));
  const int components = UsableComponents(list, list.components);
  cv::Mat row = list.mean.clone();
  if (components > 0) {
    row += list.projection.row(i).colRange(0, components) * list.eigenvectors.rowRange(0, components);
  }
  return row.reshape(1, list.gray.front().rows);
}
