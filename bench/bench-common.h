/* Shared by the benchmark files: a deterministic photo-like test picture and
 * the reporting of our time against a yardstick measured in the same run. */
#ifndef BENCH_COMMON_H
#define BENCH_COMMON_H

#include <benchmark/benchmark.h>

#include <time.h>

#include <cmath>
#include <cstdint>
#include <map>
#include <random>
#include <string>
#include <vector>

namespace bench {

constexpr int kPhotoWidth = 1280;
constexpr int kPhotoHeight = 960;

/* A BGRA picture with smooth gradients, a few soft blobs and a little noise,
 * so that table lookups and filters see photo-like value spreads rather than
 * a constant or white noise. Same seed, same bytes. */
inline std::vector<uint8_t> photo_bgra(int width = kPhotoWidth, int height = kPhotoHeight,
				       uint32_t seed = 12345)
{
	std::vector<uint8_t> pixels(static_cast<size_t>(width) * height * 4);
	std::mt19937 rng(seed);
	std::uniform_real_distribution<double> unit(0.0, 1.0);
	struct Blob { double cx, cy, radius, b, g, r; };
	std::vector<Blob> blobs(6);
	for (Blob &blob : blobs)
		blob = {unit(rng) * width, unit(rng) * height, (0.1 + 0.3 * unit(rng)) * width,
			unit(rng) * 120, unit(rng) * 120, unit(rng) * 120};
	std::uniform_int_distribution<int> noise(-6, 6);
	for (int y = 0; y < height; y++) {
		for (int x = 0; x < width; x++) {
			double b = 40.0 + 80.0 * x / width;
			double g = 60.0 + 60.0 * y / height;
			double r = 90.0 + 50.0 * (x + y) / (width + height);
			for (const Blob &blob : blobs) {
				double dx = x - blob.cx, dy = y - blob.cy;
				double weight = std::exp(-(dx * dx + dy * dy) / (blob.radius * blob.radius));
				b += blob.b * weight;
				g += blob.g * weight;
				r += blob.r * weight;
			}
			uint8_t *p = &pixels[(static_cast<size_t>(y) * width + x) * 4];
			auto clamp = [](double v) { return static_cast<uint8_t>(v < 0 ? 0 : v > 255 ? 255 : v); };
			p[0] = clamp(b + noise(rng));
			p[1] = clamp(g + noise(rng));
			p[2] = clamp(r + noise(rng));
			p[3] = 255;
		}
	}
	return pixels;
}

/* Runs the benchmark loop over body() and returns the mean processor time
 * of this thread for one iteration, in seconds, so that a later benchmark
 * can be compared with it. Thread time rather than wall time keeps the
 * ratios steady on a machine shared with other work. */
template <class Body>
inline double timed_loop(benchmark::State &state, Body &&body)
{
	auto thread_seconds = [] {
		timespec now;
		clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
		return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
	};
	const double start = thread_seconds();
	for (auto _ : state)
		body();
	const double elapsed = thread_seconds() - start;
	return state.iterations() ? elapsed / static_cast<double>(state.iterations()) : 0.0;
}

/* Mean times of the yardsticks (OpenCV, memcpy) of this run, by name. A
 * yardstick is registered before the benchmarks compared with it, and the
 * last (longest) run of each benchmark is the one kept. */
inline std::map<std::string, double> &reference_times()
{
	static std::map<std::string, double> times;
	return times;
}

inline void record_reference(const std::string &name, double seconds)
{
	reference_times()[name] = seconds;
}

/* Adds counter `counter` = seconds / time of `reference`, when that
 * yardstick ran (it is skipped by a --benchmark_filter that excludes it). */
inline void report_ratio(benchmark::State &state, const std::string &counter, double seconds,
			 const std::string &reference)
{
	auto found = reference_times().find(reference);
	if (found != reference_times().end() && found->second > 0.0)
		state.counters[counter] = seconds / found->second;
}

}

#endif
