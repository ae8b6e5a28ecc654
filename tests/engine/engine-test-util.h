/* Pictures for the engine tests: seeded random pixels, records over them,
 * and sentinel guard bytes after the pixels so that a write past the end
 * shows. */
#ifndef ENGINE_TEST_UTIL_H
#define ENGINE_TEST_UTIL_H

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <random>
#include <vector>

#include "ie-engine.h"

namespace engine_test {

constexpr uint8_t kSentinel = 0xA5;
constexpr size_t kGuardBytes = 64;

struct Picture {
	std::vector<uint8_t> bytes;
	IEL_Image record{};
	size_t size = 0;

	Picture(uint32_t width, uint32_t height, int format = IEL_FORMAT_BGRA8888, size_t bytes_per_pixel = 4)
	    : bytes(width * height * bytes_per_pixel + kGuardBytes, kSentinel), size(width * height * bytes_per_pixel)
	{
		record = {width, height, static_cast<int16_t>(format), bytes.data()};
	}
	Picture(const Picture &other) : bytes(other.bytes), record(other.record), size(other.size)
	{
		record.pbBuf = bytes.data();
	}
	Picture &operator=(const Picture &) = delete;

	uint8_t *data() { return bytes.data(); }
	std::vector<uint8_t> pixels() const { return {bytes.begin(), bytes.begin() + size}; }
	bool guard_intact() const
	{
		for (size_t i = size; i < bytes.size(); i++)
			if (bytes[i] != kSentinel)
				return false;
		return true;
	}
	/* Neither pixels nor guard written. */
	bool untouched() const { return pixels() == std::vector<uint8_t>(size, kSentinel) && guard_intact(); }
};

inline Picture random_picture(uint32_t width, uint32_t height, uint32_t seed, int format = IEL_FORMAT_BGRA8888,
			      size_t bytes_per_pixel = 4)
{
	Picture picture(width, height, format, bytes_per_pixel);
	std::mt19937 rng(seed);
	for (size_t i = 0; i < picture.size; i++)
		picture.bytes[i] = static_cast<uint8_t>(rng());
	return picture;
}

inline Picture filled_picture(uint32_t width, uint32_t height, uint8_t value)
{
	Picture picture(width, height);
	std::memset(picture.data(), value, picture.size);
	return picture;
}

/* 2^32 - 1 squared times 4 bytes cannot be addressed on any target. */
inline IEL_Image huge_record(uint8_t *pixels)
{
	return {0xffffffffu, 0xffffffffu, IEL_FORMAT_BGRA8888, pixels};
}

}

#endif
