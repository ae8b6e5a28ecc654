/* Size rule, processor check and thread count shared by the engine's
 * routines. */
#include <stdint.h>
#include <stdlib.h>
#include <string.h>

#include <atomic>
#include <thread>

#include "ie-engine-private.h"

size_t iel_byte_count(uint32_t width, uint32_t height, unsigned bytes_per_pixel, int *ok)
{
	size_t pixels = 0;
	size_t bytes = 0;
	if (__builtin_mul_overflow(static_cast<size_t>(width), static_cast<size_t>(height), &pixels) ||
	    __builtin_mul_overflow(pixels, static_cast<size_t>(bytes_per_pixel), &bytes) ||
	    bytes > static_cast<size_t>(PTRDIFF_MAX)) {
		*ok = 0;
		return 0;
	}
	*ok = 1;
	return bytes;
}

namespace {

bool switched_off(const char *variable)
{
	const char *value = getenv(variable);
	return value && strcmp(value, "1") == 0;
}

}

int iel_cpu_has_avx2(void)
{
	static const int has_avx2 = [] {
		if (switched_off("IEL_NO_SIMD"))
			return 0;
		__builtin_cpu_init();
		return __builtin_cpu_supports("avx2") ? 1 : 0;
	}();
	return has_avx2;
}

int iel_cpu_has_avx512(void)
{
	static const int has_avx512 = [] {
		if (!iel_cpu_has_avx2() || switched_off("IEL_NO_AVX512"))
			return 0;
		return __builtin_cpu_supports("avx512f") ? 1 : 0;
	}();
	return has_avx512;
}

namespace {

std::atomic<int> chosen_thread_count{ 0 };

int default_thread_count()
{
	static const int count = [] {
		const char *value = getenv("IEL_THREADS");
		const int asked = value ? atoi(value) : 0;
		if (asked > 0)
			return asked;
		const unsigned cores = std::thread::hardware_concurrency();
		return cores > 0 ? int(cores) : 1;
	}();
	return count;
}

}

int iel_thread_count(void)
{
	const int chosen = chosen_thread_count.load(std::memory_order_relaxed);
	return chosen > 0 ? chosen : default_thread_count();
}

void iel_thread_count_set(int count)
{
	chosen_thread_count.store(count > 0 ? count : 0, std::memory_order_relaxed);
}
