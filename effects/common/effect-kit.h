/* Building blocks shared by both effect libraries: argument checks, tone
 * curves, position hashes, radial distances, planes, blurs and edge
 * detection. Everything is per call: no state outlives a function. */
#ifndef EFFECT_KIT_H
#define EFFECT_KIT_H

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <vector>

#if defined(__x86_64__) || defined(__i386__)
#define KIT_X86 1
#include <immintrin.h>
#else
#define KIT_X86 0
#endif

namespace kit {

/* Every pixel routine has a plain reference and, on processors with AVX2, a
 * vector path that gives the same bytes; the tests hold one to the other. */
enum class Path { REFERENCE, AVX2 };

/* A path the tests pin so that both run in one process; nothing else
 * sets it. */
struct PathPin {
	bool pinned = false;
	Path path = Path::REFERENCE;
};

inline PathPin &path_pin()
{
	static PathPin pin;
	return pin;
}

/* AVX2 where the processor has it, unless IEL_NO_SIMD=1 (the engine's
 * switch: one variable turns every vector path off). */
inline Path best_path()
{
	if (path_pin().pinned)
		return path_pin().path;
#if KIT_X86
	static const Path path = [] {
		const char *off = std::getenv("IEL_NO_SIMD");
		if (off && std::strcmp(off, "1") == 0)
			return Path::REFERENCE;
		__builtin_cpu_init();
		return __builtin_cpu_supports("avx2") ? Path::AVX2 : Path::REFERENCE;
	}();
	return path;
#else
	return Path::REFERENCE;
#endif
}

enum Result {
	RESULT_OK = 0,
	RESULT_BAD_ARGUMENT = 1,
	RESULT_NO_MEMORY = 2
};

/* Largest picture accepted (2^27 pixels): every buffer of the picture's
 * size, floats included, stays addressable on the 32-bit target. */
constexpr int64_t MAX_PIXELS = int64_t(1) << 27;

inline bool size_usable(int64_t width, int64_t height)
{
	return width > 0 && height > 0 && width * height <= MAX_PIXELS;
}

inline uint8_t clamp_byte(int v)
{
	return uint8_t(v < 0 ? 0 : (v > 255 ? 255 : v));
}

inline uint8_t clamp_byte(float v)
{
	return uint8_t(v <= 0.f ? 0 : (v >= 255.f ? 255 : int(v + 0.5f)));
}

/* BT.601 luma in 8 bits; the weights add up to 256. */
inline int luma(int r, int g, int b)
{
	return (77 * r + 150 * g + 29 * b) >> 8;
}

inline float smoothstep(float edge0, float edge1, float x)
{
	float t = std::clamp((x - edge0) / (edge1 - edge0), 0.f, 1.f);
	return t * t * (3.f - 2.f * t);
}

/* A well-mixed 32-bit hash of a pixel position and a salt: grain, paper and
 * flecks are functions of where a pixel is, so the same picture always
 * gives the same bytes. */
inline uint32_t hash2(uint32_t x, uint32_t y, uint32_t salt = 0)
{
	uint32_t h = x * 0x8da6b343u ^ y * 0xd8163841u ^ salt * 0xcb1ab31fu;
	h ^= h >> 15;
	h *= 0x2c1b3c6du;
	h ^= h >> 12;
	h *= 0x297a2d39u;
	h ^= h >> 15;
	return h;
}

/* A 256-entry tone curve. */
struct Curve {
	uint8_t map[256];
};

/* Levels and shape in one curve: the input is raised to `gamma`, bent into
 * an S by `contrast` (0 = straight, 1 = strong), then spread between the
 * output black `lift` and the output white `gain`. */
struct CurveShape {
	float lift = 0.f;
	float gain = 255.f;
	float gamma = 1.f;
	float contrast = 0.f;
};

inline Curve make_curve(const CurveShape &shape)
{
	Curve curve;
	for (int i = 0; i < 256; ++i) {
		float x = std::pow(i / 255.f, shape.gamma);
		float s = x * x * (3.f - 2.f * x);
		x += (s - x) * shape.contrast;
		curve.map[i] = clamp_byte(shape.lift + (shape.gain - shape.lift) * x);
	}
	return curve;
}

/* Squared distance from a centre (cx, cy in -1..1 of the picture) over an
 * ellipse fitted to the picture, in 1/256ths of the squared distance from
 * the middle to a corner, capped at RADIAL_CAP. Split into a row part and a
 * column part so that the inner loop only adds. */
constexpr int RADIAL_CAP = 1023;

struct Radial {
	std::vector<int32_t> column;
	std::vector<int32_t> row;

	Radial(int width, int height, float cx, float cy) : column(size_t(width)), row(size_t(height))
	{
		/* The squared distance from the middle to a corner is 2. */
		auto part = [](int i, int n, float centre) {
			float d = (float(i) + 0.5f) / float(n) * 2.f - 1.f - centre;
			return int32_t(std::min(d * d * 128.f, float(RADIAL_CAP)));
		};
		for (int x = 0; x < width; ++x)
			column[size_t(x)] = part(x, width, cx);
		for (int y = 0; y < height; ++y)
			row[size_t(y)] = part(y, height, cy);
	}
};

/* One channel of a picture as floats, rows back to back. */
struct Plane {
	int width = 0;
	int height = 0;
	std::vector<float> v;

	Plane() = default;
	Plane(int w, int h, float fill = 0.f) : width(w), height(h), v(size_t(w) * size_t(h), fill) {}
};

/* A picture as three float planes (red, green, blue). */
struct Rgb {
	Plane r, g, b;

	Rgb(int w, int h) : r(w, h), g(w, h), b(w, h) {}
	int width() const { return r.width; }
	int height() const { return r.height; }
};

/* Reads packed pixels whose red, green and blue are at the given byte
 * offsets; `step` is the bytes per pixel. */
inline Rgb read_rgb(const uint8_t *px, int width, int height, int step, int ri, int gi, int bi)
{
	Rgb rgb(width, height);
	size_t n = size_t(width) * size_t(height);
	for (size_t i = 0; i < n; ++i, px += step) {
		rgb.r.v[i] = px[ri];
		rgb.g.v[i] = px[gi];
		rgb.b.v[i] = px[bi];
	}
	return rgb;
}

inline Plane luma_plane(const Rgb &rgb)
{
	Plane y(rgb.width(), rgb.height());
	for (size_t i = 0; i < y.v.size(); ++i)
		y.v[i] = 0.299f * rgb.r.v[i] + 0.587f * rgb.g.v[i] + 0.114f * rgb.b.v[i];
	return y;
}

/* Writes the planes back, clamped and rounded; a fourth byte, when the
 * layout has one, is set opaque. */
inline void write_rgb(const Rgb &rgb, uint8_t *px, int step, int ri, int gi, int bi)
{
	size_t n = rgb.r.v.size();
	for (size_t i = 0; i < n; ++i, px += step) {
		px[ri] = clamp_byte(rgb.r.v[i]);
		px[gi] = clamp_byte(rgb.g.v[i]);
		px[bi] = clamp_byte(rgb.b.v[i]);
		if (step == 4)
			px[3] = 255;
	}
}

/* Box mean of radius r over every row, the border repeated; a running sum
 * makes it O(1) per sample whatever the radius. */
inline void box_blur_rows(Plane &p, int radius)
{
	const int w = p.width;
	const float norm = 1.f / float(2 * radius + 1);
	std::vector<float> line(size_t(w + 2 * radius + 1));
	for (int y = 0; y < p.height; ++y) {
		float *row = p.v.data() + size_t(y) * size_t(w);
		for (int i = 0; i < radius; ++i) {
			line[size_t(i)] = row[0];
			line[size_t(w + radius + i)] = row[w - 1];
		}
		line[size_t(w + 2 * radius)] = row[w - 1];
		std::copy(row, row + w, line.begin() + radius);
		float sum = 0.f;
		for (int i = 0; i < 2 * radius + 1; ++i)
			sum += line[size_t(i)];
		for (int x = 0; x < w; ++x) {
			row[x] = sum * norm;
			sum += line[size_t(x + 2 * radius + 1)] - line[size_t(x)];
		}
	}
}

/* The same down the columns, a whole row at a time so that memory is read
 * in order; writes into `dst` (the same size). */
inline void box_blur_columns(const Plane &src, Plane &dst, int radius)
{
	const size_t w = size_t(src.width);
	const int h = src.height;
	const float norm = 1.f / float(2 * radius + 1);
	auto row = [&](int y) { return src.v.data() + size_t(std::clamp(y, 0, h - 1)) * w; };
	std::vector<float> sum(w, 0.f);
	for (int y = -radius; y <= radius; ++y) {
		const float *r = row(y);
		for (size_t x = 0; x < w; ++x)
			sum[x] += r[x];
	}
	for (int y = 0; y < h; ++y) {
		float *out = dst.v.data() + size_t(y) * w;
		const float *enter = row(y + radius + 1), *leave = row(y - radius);
		for (size_t x = 0; x < w; ++x) {
			out[x] = sum[x] * norm;
			sum[x] += enter[x] - leave[x];
		}
	}
}

/* Direct separable convolution with a sampled Gaussian: exact for the
 * small widths where box passes, whose radius is a whole number, cannot
 * tell sigma 0.8 from sigma 1.2. */
inline void gaussian_blur_kernel(Plane &p, float sigma)
{
	const int radius = std::max(1, int(std::ceil(3.f * sigma)));
	std::vector<float> kernel(size_t(2 * radius + 1));
	float total = 0.f;
	for (int i = -radius; i <= radius; ++i)
		total += kernel[size_t(i + radius)] = std::exp(-float(i * i) / (2.f * sigma * sigma));
	for (float &k : kernel)
		k /= total;
	const int w = p.width, h = p.height;
	Plane tmp(w, h);
	std::vector<float> line(size_t(w + 2 * radius));
	for (int y = 0; y < h; ++y) {
		const float *src = &p.v[size_t(y) * size_t(w)];
		for (int i = 0; i < w + 2 * radius; ++i)
			line[size_t(i)] = src[std::clamp(i - radius, 0, w - 1)];
		/* Tap by tap over the whole row, so the loop vectorises. */
		float *dst = &tmp.v[size_t(y) * size_t(w)];
		std::fill(dst, dst + w, 0.f);
		for (int k = 0; k <= 2 * radius; ++k) {
			const float *shifted = &line[size_t(k)];
			const float weight = kernel[size_t(k)];
			for (int x = 0; x < w; ++x)
				dst[x] += shifted[x] * weight;
		}
	}
	for (int y = 0; y < h; ++y) {
		float *dst = &p.v[size_t(y) * size_t(w)];
		std::fill(dst, dst + w, 0.f);
		for (int k = -radius; k <= radius; ++k) {
			const float *src = &tmp.v[size_t(std::clamp(y + k, 0, h - 1)) * size_t(w)];
			const float weight = kernel[size_t(k + radius)];
			for (int x = 0; x < w; ++x)
				dst[x] += src[x] * weight;
		}
	}
}

/* Gaussian blur at full resolution: the exact kernel when narrow, three
 * box passes (each of variance r(r+1)/3) when wide. */
inline void gaussian_blur_full(Plane &p, float sigma)
{
	if (sigma <= 0.f)
		return;
	if (sigma < 2.5f) {
		gaussian_blur_kernel(p, sigma);
		return;
	}
	float r = (std::sqrt(4.f * sigma * sigma + 1.f) - 1.f) / 2.f;
	int radius = std::max(1, int(r + 0.5f));
	Plane scratch(p.width, p.height);
	for (int pass = 0; pass < 3; ++pass) {
		box_blur_rows(p, radius);
		box_blur_columns(p, scratch, radius);
		std::swap(p.v, scratch.v);
	}
}

/* Mean of each factor x factor block (the last ones partial). */
inline Plane shrink(const Plane &p, int factor)
{
	Plane small((p.width + factor - 1) / factor, (p.height + factor - 1) / factor);
	std::vector<float> row_sum(size_t(small.width));
	for (int sy = 0; sy < small.height; ++sy) {
		std::fill(row_sum.begin(), row_sum.end(), 0.f);
		const int y0 = sy * factor, y1 = std::min(y0 + factor, p.height);
		for (int y = y0; y < y1; ++y) {
			const float *src = &p.v[size_t(y) * size_t(p.width)];
			if (factor == 2) {
				/* The common case, without the inner loop's overhead. */
				const int pairs = p.width / 2;
				for (int sx = 0; sx < pairs; ++sx)
					row_sum[size_t(sx)] += src[2 * sx] + src[2 * sx + 1];
				if (p.width % 2)
					row_sum[size_t(pairs)] += src[p.width - 1];
				continue;
			}
			for (int sx = 0; sx < small.width; ++sx) {
				const int x0 = sx * factor, x1 = std::min(x0 + factor, p.width);
				float sum = 0.f;
				for (int x = x0; x < x1; ++x)
					sum += src[x];
				row_sum[size_t(sx)] += sum;
			}
		}
		float *dst = &small.v[size_t(sy) * size_t(small.width)];
		for (int sx = 0; sx < small.width; ++sx) {
			const int columns = std::min(factor, p.width - sx * factor);
			dst[sx] = row_sum[size_t(sx)] / float(columns * (y1 - y0));
		}
	}
	return small;
}

/* Bilinear enlargement of a shrunk plane back over `p`. */
inline void expand_into(const Plane &small, int factor, Plane &p)
{
	const float inverse = 1.f / float(factor);
	std::vector<int> x0(size_t(p.width)), x1(size_t(p.width));
	std::vector<float> fx(size_t(p.width));
	for (int x = 0; x < p.width; ++x) {
		float sx = std::clamp((float(x) + 0.5f) * inverse - 0.5f, 0.f, float(small.width - 1));
		x0[size_t(x)] = int(sx);
		x1[size_t(x)] = std::min(int(sx) + 1, small.width - 1);
		fx[size_t(x)] = sx - float(int(sx));
	}
	for (int y = 0; y < p.height; ++y) {
		float sy = std::clamp((float(y) + 0.5f) * inverse - 0.5f, 0.f, float(small.height - 1));
		int y0 = int(sy), y1 = std::min(y0 + 1, small.height - 1);
		float fy = sy - float(y0);
		const float *top = &small.v[size_t(y0) * size_t(small.width)];
		const float *bottom = &small.v[size_t(y1) * size_t(small.width)];
		float *dst = &p.v[size_t(y) * size_t(p.width)];
		for (int x = 0; x < p.width; ++x) {
			size_t a = size_t(x0[size_t(x)]), b = size_t(x1[size_t(x)]);
			float t = top[a] + (top[b] - top[a]) * fx[size_t(x)];
			float u = bottom[a] + (bottom[b] - bottom[a]) * fx[size_t(x)];
			dst[x] = t + (u - t) * fy;
		}
	}
}

/* Gaussian blur; a wide one is computed on a shrunk copy, where it costs a
 * fraction and looks the same. */
inline void gaussian_blur(Plane &p, float sigma)
{
	const int factor = std::min({int(sigma / 1.6f), p.width, p.height});
	if (factor < 2) {
		gaussian_blur_full(p, sigma);
		return;
	}
	Plane small = shrink(p, factor);
	gaussian_blur_full(small, std::sqrt(std::max(0.f, sigma * sigma - float(factor * factor) / 4.f)) / float(factor));
	expand_into(small, factor, p);
}

/* Sobel gradient magnitude of a plane, the border repeated. */
inline Plane sobel_magnitude(const Plane &p)
{
	const int w = p.width, h = p.height;
	Plane g(w, h);
	for (int y = 0; y < h; ++y) {
		const float *up = &p.v[size_t(std::max(y - 1, 0)) * size_t(w)];
		const float *mid = &p.v[size_t(y) * size_t(w)];
		const float *down = &p.v[size_t(std::min(y + 1, h - 1)) * size_t(w)];
		float *mag = &g.v[size_t(y) * size_t(w)];
		for (int x = 0; x < w; ++x) {
			int l = std::max(x - 1, 0), r = std::min(x + 1, w - 1);
			float dx = (up[r] + 2.f * mid[r] + down[r]) - (up[l] + 2.f * mid[l] + down[l]);
			float dy = (down[l] + 2.f * down[x] + down[r]) - (up[l] + 2.f * up[x] + up[r]);
			mag[x] = std::sqrt(dx * dx + dy * dy);
		}
	}
	return g;
}

/* Runs a function and turns an allocation failure into a result code, so
 * that no exception crosses the C interface. */
template <typename F>
int guarded(F &&body)
{
	try {
		return body();
	} catch (const std::bad_alloc &) {
		return RESULT_NO_MEMORY;
	}
}

} // namespace kit

#endif
