// frames-before.cpp as advised: the shapes have a pool, which the end of a frame resets.
#include "Resident.h"

#include <MemPoolAllocator>
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
      byLayer[layer].push_back(new (shapePool.allocate(1)) Shape{1, 2, 0, layer});
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
    for (auto& layer : byLayer)
      layer.clear();
    pool.Reset();
  }

private:
  VOK::MemPool::Mgr pool{"shapes", VOK::MemPool::Options().On()};
  VOK::MemPool::Allocator<Shape> shapePool{pool};
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
