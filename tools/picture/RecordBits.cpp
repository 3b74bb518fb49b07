#include "picture/RecordBits.h"

#include <bit>

namespace VOK::MemPool::Tools {

namespace {

class Bits {
public:
  /// The lowest `width` bits, the highest of them first.
  void Put(std::uint64_t value, int width) {
    for (int bit = width - 1; bit >= 0; --bit) {
      digit = digit * 2 + (value >> bit & 1);
      if (++filled == 6) Flush();
    }
  }

  std::string Take() {
    while (filled != 0)
      Put(0, 1);
    return std::move(text);
  }

private:
  void Flush() {
    constexpr char digits[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    text += digits[digit];
    digit = 0;
    filled = 0;
  }

  std::string text;
  std::size_t digit = 0;
  int filled = 0;
};

class Writer {
public:
  explicit Writer(const BucketReport& bucket_)
      : bucket(bucket_), count(bucket_.records.rows.size()),
        width(static_cast<int>(std::bit_width(count))) {}

  std::string Write() {
    for (std::size_t i = 0; i < count; ++i)
      Record(i);
    return bits.Take();
  }

private:
  void Record(std::size_t i) {
    switch (bucket.records.rows[i].type) {
    case Type::Used:
      return bits.Put(0, 1);
    case Type::Free:
      return Link(i, i < bucket.map.boxes.size() ? bucket.map.boxes[i].number : 0);
    case Type::Ext:
      return bits.Put(0b100001, 6);
    case Type::Unknown:
      return bits.Put(0b100000, 6);
    }
  }

  void Link(std::size_t i, Number next) {
    const std::size_t index = IndexOf(next);
    if (index > count) {
      bits.Put(0b10001, 5);
      bits.Put(next, 32);
    } else if (index == count || (index != i + 1 && index + 1 != i)) {
      bits.Put(0b11, 2);
      bits.Put(index, width);
    } else if (index == i + 1) {
      bits.Put(0b101, 3);
    } else {
      bits.Put(0b1001, 4);
    }
  }

  /// The record at an offset, `count` for offset 0 and more for what is no record's offset.
  std::size_t IndexOf(Number offset) const {
    if (offset == 0) return count;
    const Number size = bucket.recSize;
    if (offset < 2 || size == 0 || (offset - 2) % size != 0) return count + 1;
    const std::size_t index = (offset - 2) / size;
    return index < count ? index : count + 1;
  }

  const BucketReport& bucket;
  const std::size_t count;
  const int width;
  Bits bits;
};

} // namespace

std::string RecordBits(const BucketReport& bucket) { return Writer(bucket).Write(); }

std::string FlagBits(const std::vector<bool>& flags) {
  Bits bits;
  for (const bool flag : flags)
    bits.Put(flag ? 1 : 0, 1);
  return bits.Take();
}

} // namespace VOK::MemPool::Tools
