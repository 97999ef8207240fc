#ifndef QVTESTER_DESK_DRAWING_PALETTE_H_
#define QVTESTER_DESK_DRAWING_PALETTE_H_

#include <array>

namespace qv {

// All colours of what is drawn. Told apart by those who see no red or no green, too: each differs in lightness.

struct Colour {
  double red, green, blue;
};

/// What a line or a word stands for.
enum class Tone { kPlain, kGood, kDoubtful, kPoor };
inline constexpr Tone kInk = Tone::kPlain;
inline constexpr Tone kGood = Tone::kGood;
inline constexpr Tone kDoubtful = Tone::kDoubtful;
inline constexpr Tone kPoor = Tone::kPoor;

inline constexpr Colour kPaper = {1, 1, 1};           // the picture's ground
inline constexpr Colour kLabel = {0.12, 0.12, 0.14};  // that of words on a photo, and the edge of lines there
inline constexpr Colour kFaint = {0.72, 0.72, 0.74};  // grids; no text

struct PaletteRow {
  Tone tone;
  const char* name;
  Colour on_label;  // words on labels, lines on photos
  Colour on_paper;  // words and lines on paper; the ground of white words
};
inline constexpr std::array<PaletteRow, 4> kPalette = {{
    {Tone::kPlain, "plain", {1, 1, 1}, {0.12, 0.12, 0.14}},
    {Tone::kGood, "good: cyan", {0.0, 0.75, 0.85}, {0.0, 0.38, 0.58}},
    {Tone::kDoubtful, "doubtful: yellow", {0.95, 0.80, 0.0}, {0.48, 0.35, 0.0}},
    {Tone::kPoor, "poor: red", {1.0, 0.45, 0.35}, {0.75, 0.10, 0.05}},
}};

constexpr Colour OnLabel(Tone tone) { return kPalette[static_cast<std::size_t>(tone)].on_label; }
constexpr Colour OnPaper(Tone tone) { return kPalette[static_cast<std::size_t>(tone)].on_paper; }

/// How a curve is drawn, so that two that coincide are both seen.
enum class Dash { kSolid, kDashed, kDotted };
enum class PointShape { kNone, kCircle, kSquare, kTriangle };
struct Series {
  Colour colour;
  Dash dash;
  PointShape shape;
};
inline constexpr std::array<Series, 3> kSeries = {{
    {{0.0, 0.35, 0.70}, Dash::kSolid, PointShape::kCircle},     // blue
    {{0.84, 0.37, 0.0}, Dash::kDashed, PointShape::kSquare},    // orange
    {{0.10, 0.10, 0.12}, Dash::kDotted, PointShape::kTriangle}  // black
}};

}  // namespace qv

#endif  // QVTESTER_DESK_DRAWING_PALETTE_H_
