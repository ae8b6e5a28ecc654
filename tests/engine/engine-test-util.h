/* Pictures for the engine tests: seeded random pixels, and sentinel guard
 * bytes after them so that a write past the end shows. */
#ifndef ENGINE_TEST_UTIL_H
#define ENGINE_TEST_UTIL_H

#include <platform_log.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <random>
#include <string>
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
	Picture(const Picture &o) : bytes(o.bytes), record(o.record), size(o.size) { record.pbBuf = bytes.data(); }
	Picture &operator=(const Picture &) = delete;

	uint8_t *data() { return bytes.data(); }
	std::vector<uint8_t> pixels() const { return {bytes.begin(), bytes.begin() + size}; }
	bool guard_intact() const { return std::count(bytes.begin() + size, bytes.end(), kSentinel) == kGuardBytes; }
	bool untouched() const { return std::count(bytes.begin(), bytes.end(), kSentinel) == long(bytes.size()); }
};

inline Picture random_picture(uint32_t width, uint32_t height, uint32_t seed, int format = IEL_FORMAT_BGRA8888,
			      size_t bytes_per_pixel = 4)
{
	Picture picture(width, height, format, bytes_per_pixel);
	std::mt19937 rng(seed);
	std::generate_n(picture.bytes.begin(), picture.size, [&] { return static_cast<uint8_t>(rng()); });
	return picture;
}

inline Picture zeroed_picture(uint32_t width, uint32_t height)
{
	Picture picture(width, height);
	std::fill_n(picture.bytes.begin(), picture.size, 0);
	return picture;
}

/* The text between the colour codes of the single logged line, which must
 * carry the engine's tag and priority. */
inline std::string only_message()
{
	if (platform_log_record_count() != 1)
		return std::to_string(platform_log_record_count()) + " lines";
	EXPECT_STREQ(platform_log_record_tag(0), "MARLUNE");
	EXPECT_EQ(platform_log_record_priority(0), PLATFORM_LOG_ERROR);
	const std::string text = platform_log_record_text(0);
	const size_t start = text.find("\033[31m"), end = text.rfind("\033[0m");
	return start == std::string::npos || end == std::string::npos ? text : text.substr(start + 5, end - start - 5);
}

}

#endif
