// The shapes of a picture, frame by frame: each frame makes its own, paints them from back to
// front, and drops them in that order.
#include "Resident.h"

#include <cstdint>
#include <iostream>
#include <random>
#include <vector>

namespace {

constexpr int frames = 1500, shapes = 4000;
constexpr std::uint32_t layers = 100;

struct Shape {
  double width, height;
  std::uint32_t colour, layer;
};

class Painter {
public:
  void MakeShapes() {
    for (int i = 0; i < shapes; ++i) {
      const auto layer = static_cast<std::uint32_t>(random() % layers);
      byLayer[layer].push_back(new Shape{1, 2, 0, layer});
    }
  }
  double Paint() const {
    double area = 0;
    for (const auto& layer : byLayer)
      for (const Shape* shape : layer)
        area += shape->width * shape->height;
    return area;
  }
  void DropShapes() {
    for (auto& layer : byLayer) {
      for (const Shape* shape : layer)
        delete shape;
      layer.clear();
    }
  }

private:
  std::minstd_rand random;
  std::vector<std::vector<Shape*>> byLayer{layers};
};

} // namespace

int main() {
  const long before = ResidentKiB();
  Painter painter;
  double area = 0;
  for (int frame = 0; frame < frames; ++frame) {
    painter.MakeShapes();
    area += painter.Paint();
    if (frame == frames - 1) std::cerr << "heap " << ResidentKiB() - before << " KiB\n";
    painter.DropShapes();
  }
  std::cout << area << '\n';
}
