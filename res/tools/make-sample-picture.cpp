/* Paints the demo's sample picture: a lake landscape with a sky gradient,
 * sun, layered mountains with snow, reflections, fir trees, a red boat
 * house and textured grass. It has smooth areas, fine texture, strong
 * edges and saturated colours, so crops, rotations and every effect are
 * easy to judge. Deterministic: the same file on every run. */
#include <cstdio>
#include <jpeglib.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <vector>

namespace {

constexpr int kWidth = 2000;
constexpr int kHeight = 1500;
constexpr int kHorizon = 900; // the lake's far shore

struct Rgb {
	double r, g, b;
};

Rgb mix(Rgb a, Rgb b, double t)
{
	t = std::clamp(t, 0.0, 1.0);
	return {a.r + (b.r - a.r) * t, a.g + (b.g - a.g) * t, a.b + (b.b - a.b) * t};
}

double smoothstep(double e0, double e1, double x)
{
	double t = std::clamp((x - e0) / (e1 - e0), 0.0, 1.0);
	return t * t * (3.0 - 2.0 * t);
}

/* Integer hash to [0, 1): the source of all randomness. */
double hash(int x, int y, int seed)
{
	uint32_t h = static_cast<uint32_t>(x) * 374761393u + static_cast<uint32_t>(y) * 668265263u +
		     static_cast<uint32_t>(seed) * 2246822519u;
	h = (h ^ (h >> 13)) * 1274126177u;
	h ^= h >> 16;
	return (h & 0xffffff) / 16777216.0;
}

double value_noise(double x, double y, int seed)
{
	int xi = static_cast<int>(std::floor(x)), yi = static_cast<int>(std::floor(y));
	double fx = x - xi, fy = y - yi;
	fx = fx * fx * (3 - 2 * fx);
	fy = fy * fy * (3 - 2 * fy);
	double a = hash(xi, yi, seed), b = hash(xi + 1, yi, seed);
	double c = hash(xi, yi + 1, seed), d = hash(xi + 1, yi + 1, seed);
	return a + (b - a) * fx + (c - a) * fy + (a - b - c + d) * fx * fy;
}

double fractal(double x, double y, int seed, int octaves)
{
	double sum = 0, amplitude = 0.5, norm = 0;
	for (int i = 0; i < octaves; i++) {
		sum += value_noise(x, y, seed + i * 31) * amplitude;
		norm += amplitude;
		x *= 2.03;
		y *= 2.03;
		amplitude *= 0.5;
	}
	return sum / norm;
}

/* Height of a mountain range's ridge (y of its top edge) at column x. */
double ridge(double x, double base, double height, double scale, int seed)
{
	double n = fractal(x / scale, 0.5, seed, 6);
	double peaks = std::fabs(std::sin(x / scale * 2.1 + seed)) * 0.35;
	return base - height * (n * 0.8 + peaks);
}

struct Picture {
	std::vector<Rgb> px = std::vector<Rgb>(static_cast<size_t>(kWidth) * kHeight);
	Rgb &at(int x, int y) { return px[static_cast<size_t>(y) * kWidth + x]; }
};

const double kSunX = 1380, kSunY = 420, kSunRadius = 70;

Rgb sky(int x, int y)
{
	double t = static_cast<double>(y) / kHorizon;
	Rgb top{28, 62, 150}, middle{96, 150, 220}, low{255, 178, 110};
	Rgb c = t < 0.6 ? mix(top, middle, t / 0.6) : mix(middle, low, (t - 0.6) / 0.4);
	double d = std::hypot(x - kSunX, y - kSunY);
	c = mix(c, Rgb{255, 236, 170}, 0.55 * std::exp(-d / 260.0));
	if (d < kSunRadius)
		c = mix(Rgb{255, 248, 220}, c, smoothstep(kSunRadius - 2, kSunRadius, d));
	/* Thin streaks of cloud. */
	double cloud = fractal(x / 420.0, y / 60.0, 7, 5);
	c = mix(c, Rgb{250, 235, 240}, smoothstep(0.58, 0.8, cloud) * 0.7 * (1.0 - t * 0.5));
	return c;
}

/* Paints the land above the horizon; returns whether (x, y) is land. */
bool land(int x, int y, Rgb *out)
{
	double far_top = ridge(x, 760, 330, 520, 3);
	double near_top = ridge(x, kHorizon - 10, 230, 300, 11);
	if (y >= near_top) {
		double shade = fractal(x / 40.0, y / 40.0, 19, 4);
		*out = mix(Rgb{34, 70, 46}, Rgb{62, 104, 60}, shade);
		return true;
	}
	if (y >= far_top) {
		double depth = (y - far_top) / 260.0;
		double rock = fractal(x / 25.0, y / 25.0, 5, 5);
		Rgb c = mix(Rgb{92, 96, 132}, Rgb{58, 62, 98}, depth + rock * 0.3);
		/* Snow on the upper slopes, broken up by the rock texture. */
		double snow = smoothstep(0.10, 0.02, depth + (rock - 0.5) * 0.12);
		if (far_top < 560)
			c = mix(c, Rgb{240, 242, 250}, snow);
		/* Slopes facing the sun (on the right) catch its light. */
		double slope = ridge(x + 12, 760, 330, 520, 3) - ridge(x - 12, 760, 330, 520, 3);
		c = mix(c, Rgb{255, 210, 170}, std::clamp(slope / 40.0, 0.0, 1.0) * 0.3);
		*out = c;
		return true;
	}
	return false;
}

void paint_scene(Picture &p)
{
	for (int y = 0; y < kHorizon; y++)
		for (int x = 0; x < kWidth; x++) {
			Rgb c;
			p.at(x, y) = land(x, y, &c) ? c : sky(x, y);
		}
}

/* Fir trees on the far shore: dark triangles with a little light. */
void paint_trees(Picture &p)
{
	for (int i = 0; i < 70; i++) {
		double x0 = hash(i, 1, 101) * kWidth;
		double height = 60 + hash(i, 2, 101) * 90;
		double base = kHorizon - 4 - hash(i, 3, 101) * 20;
		double half = height * 0.22;
		for (int y = static_cast<int>(base - height); y < base; y++)
			for (int x = static_cast<int>(x0 - half); x <= x0 + half; x++) {
				if (x < 0 || x >= kWidth || y < 0)
					continue;
				double row = (y - (base - height)) / height; // 0 at the tip
				double w = half * row * (0.75 + 0.25 * std::fabs(std::sin(row * 18)));
				double dx = std::fabs(x - x0);
				if (dx > w + 1)
					continue;
				double edge = std::clamp(w + 1 - dx, 0.0, 1.0);
				Rgb c = mix(Rgb{14, 46, 28}, Rgb{40, 90, 44}, x < x0 ? 0.15 : 0.55);
				p.at(x, y) = mix(p.at(x, y), c, edge);
			}
	}
}

/* A red boat house with white trim on the left shore: strong edges. */
void paint_house(Picture &p)
{
	const int left = 300, right = 520, top = 760, bottom = kHorizon + 6;
	for (int y = top - 90; y < bottom; y++)
		for (int x = left - 20; x < right + 20; x++) {
			int mid = (left + right) / 2;
			bool roof = y < top && std::abs(x - mid) < (y - (top - 90)) * 1.4;
			bool wall = y >= top && x >= left && x < right;
			if (roof)
				p.at(x, y) = Rgb{50, 44, 48};
			else if (wall) {
				bool plank = (y - top) % 14 == 0;
				bool door = x > mid - 40 && x < mid + 40 && y > top + 40;
				bool trim = x < left + 6 || x >= right - 6;
				Rgb c{196, 28, 32};
				if (plank)
					c = Rgb{150, 20, 24};
				if (door)
					c = Rgb{250, 250, 245};
				if (trim)
					c = Rgb{245, 245, 240};
				p.at(x, y) = c;
			}
		}
}

/* The lake mirrors everything above the horizon with rippled rows. */
void paint_lake(Picture &p)
{
	const int lake_bottom = 1220;
	for (int y = kHorizon; y < lake_bottom; y++) {
		double depth = static_cast<double>(y - kHorizon) / (lake_bottom - kHorizon);
		for (int x = 0; x < kWidth; x++) {
			double ripple = (fractal(x / 90.0, y / 6.0, 23, 3) - 0.5) * (6 + depth * 30);
			int sx = std::clamp(static_cast<int>(x + ripple), 0, kWidth - 1);
			int sy = std::clamp(2 * kHorizon - y - 1, 0, kHorizon - 1);
			Rgb c = mix(p.at(sx, sy), Rgb{20, 60, 96}, 0.25 + depth * 0.35);
			/* Glints of the sun on the water. */
			double glint = fractal(x / 14.0, y / 3.0, 29, 2);
			double beam = std::exp(-std::fabs(x - kSunX) / (60 + depth * 200));
			c = mix(c, Rgb{255, 240, 200}, smoothstep(0.62, 0.75, glint) * beam);
			p.at(x, y) = c;
		}
	}
}

/* Foreground grass: a fine, saturated texture with blades. */
void paint_grass(Picture &p)
{
	for (int y = 1180; y < kHeight; y++)
		for (int x = 0; x < kWidth; x++) {
			double shore = 1210 + (fractal(x / 120.0, 0.5, 41, 4) - 0.5) * 60;
			if (y < shore)
				continue;
			double blade = hash(x / 3, y / 11, 43);
			double light = fractal(x / 8.0, y / 30.0, 47, 3);
			Rgb c = mix(Rgb{40, 110, 20}, Rgb{150, 200, 40}, light * 0.8 + blade * 0.3);
			double edge = std::clamp(y - shore, 0.0, 1.0);
			p.at(x, y) = mix(p.at(x, y), c, edge);
		}
	/* Yellow and magenta flowers. */
	for (int i = 0; i < 260; i++) {
		int cx = static_cast<int>(hash(i, 5, 53) * kWidth);
		int cy = 1260 + static_cast<int>(hash(i, 6, 53) * (kHeight - 1270));
		Rgb colour = hash(i, 7, 53) < 0.5 ? Rgb{255, 215, 0} : Rgb{230, 40, 150};
		for (int y = cy - 6; y <= cy + 6; y++)
			for (int x = cx - 6; x <= cx + 6; x++) {
				if (x < 0 || x >= kWidth || y >= kHeight)
					continue;
				double d = std::hypot(x - cx, y - cy);
				p.at(x, y) = mix(p.at(x, y), colour, std::clamp(5.5 - d, 0.0, 1.0));
			}
	}
}

bool write_jpeg(const char *path, Picture &p)
{
	FILE *f = std::fopen(path, "wb");
	if (!f)
		return false;
	jpeg_compress_struct cinfo;
	jpeg_error_mgr jerr;
	cinfo.err = jpeg_std_error(&jerr);
	jpeg_create_compress(&cinfo);
	jpeg_stdio_dest(&cinfo, f);
	cinfo.image_width = kWidth;
	cinfo.image_height = kHeight;
	cinfo.input_components = 3;
	cinfo.in_color_space = JCS_RGB;
	jpeg_set_defaults(&cinfo);
	jpeg_set_quality(&cinfo, 92, TRUE);
	jpeg_start_compress(&cinfo, TRUE);
	std::vector<JSAMPLE> row(kWidth * 3);
	while (cinfo.next_scanline < cinfo.image_height) {
		int y = static_cast<int>(cinfo.next_scanline);
		for (int x = 0; x < kWidth; x++) {
			const Rgb &c = p.at(x, y);
			row[x * 3 + 0] = static_cast<JSAMPLE>(std::clamp(std::lround(c.r), 0L, 255L));
			row[x * 3 + 1] = static_cast<JSAMPLE>(std::clamp(std::lround(c.g), 0L, 255L));
			row[x * 3 + 2] = static_cast<JSAMPLE>(std::clamp(std::lround(c.b), 0L, 255L));
		}
		JSAMPROW rows[1] = {row.data()};
		jpeg_write_scanlines(&cinfo, rows, 1);
	}
	jpeg_finish_compress(&cinfo);
	jpeg_destroy_compress(&cinfo);
	return std::fclose(f) == 0;
}

} // namespace

int main(int argc, char **argv)
{
	if (argc != 2) {
		std::fprintf(stderr, "usage: %s OUTPUT.jpg\n", argv[0]);
		return 2;
	}
	Picture picture;
	paint_scene(picture);
	paint_trees(picture);
	paint_house(picture);
	paint_lake(picture);
	paint_grass(picture);
	if (!write_jpeg(argv[1], picture)) {
		std::fprintf(stderr, "cannot write %s\n", argv[1]);
		return 1;
	}
	return 0;
}
