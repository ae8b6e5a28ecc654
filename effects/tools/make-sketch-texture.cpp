/* Writes the sketch effect's paper texture: 512 rows of 384 pixels, three
 * bytes each (blue, green, red), no header. Off-white paper with a fibrous
 * grain, covered in pencil hatching: long strokes in one direction and
 * shorter, lighter strokes across them. Deterministic: every value is a
 * function of the pixel position. */
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <vector>

namespace {

constexpr double PI = 3.14159265358979323846;
constexpr int WIDTH = 384;
constexpr int HEIGHT = 512;

uint32_t hash2(uint32_t x, uint32_t y, uint32_t salt)
{
	uint32_t h = x * 0x8da6b343u ^ y * 0xd8163841u ^ salt * 0xcb1ab31fu;
	h ^= h >> 15;
	h *= 0x2c1b3c6du;
	h ^= h >> 12;
	h *= 0x297a2d39u;
	h ^= h >> 15;
	return h;
}

double unit(uint32_t h)
{
	return double(h >> 8) / double(1u << 24);
}

double value_noise(double x, double y, double cell, uint32_t salt)
{
	double fx = x / cell, fy = y / cell;
	int ix = int(std::floor(fx)), iy = int(std::floor(fy));
	double tx = fx - ix, ty = fy - iy;
	tx = tx * tx * (3 - 2 * tx);
	ty = ty * ty * (3 - 2 * ty);
	auto corner = [salt](int cx, int cy) { return unit(hash2(uint32_t(cx), uint32_t(cy), salt)); };
	double top = corner(ix, iy) + (corner(ix + 1, iy) - corner(ix, iy)) * tx;
	double bottom = corner(ix, iy + 1) + (corner(ix + 1, iy + 1) - corner(ix, iy + 1)) * tx;
	return top + (bottom - top) * ty;
}

/* Darkness (0..1) of one family of hatching strokes at (x, y): parallel
 * strokes `spacing` apart at `angle`, broken into dashes of varying length
 * and pressure, each a soft line about a pixel wide. */
double hatching(double x, double y, double angle, double spacing, double length, double pressure, uint32_t salt)
{
	double c = std::cos(angle), s = std::sin(angle);
	double along = x * c + y * s;
	double across = -x * s + y * c;
	double lane = std::floor(across / spacing);
	/* A slight wobble keeps the strokes hand-drawn. */
	double wobble = (value_noise(along, lane * 17.0, 40.0, salt + 1) - 0.5) * 1.2;
	double offset = across - (lane + 0.5) * spacing - wobble;
	double shift = unit(hash2(uint32_t(int(lane)), 0, salt + 2)) * length;
	double dash = std::floor((along + shift) / length);
	uint32_t h = hash2(uint32_t(int(lane)), uint32_t(int(dash)), salt + 3);
	if (unit(h) < 0.18)
		return 0.0; /* a gap between strokes */
	double t = (along + shift) / length - dash;
	double taper = std::sin(PI * t);
	double strength = pressure * (0.55 + 0.45 * unit(h * 2654435761u)) * std::sqrt(taper);
	double profile = std::exp(-offset * offset / 0.3);
	return strength * profile;
}

} // namespace

int main(int argc, char **argv)
{
	if (argc != 2) {
		std::fprintf(stderr, "usage: %s out.raw\n", argv[0]);
		return 2;
	}
	std::vector<unsigned char> pixels(size_t(WIDTH) * HEIGHT * 3);
	for (int y = 0; y < HEIGHT; ++y) {
		for (int x = 0; x < WIDTH; ++x) {
			double fibre = value_noise(x, y, 2.5, 11) * 0.5 + value_noise(x, y, 9.0, 12) * 0.35 +
				       value_noise(x, y * 0.3, 5.0, 13) * 0.15;
			double paper = 238.0 + (fibre - 0.5) * 14.0 + (unit(hash2(uint32_t(x), uint32_t(y), 14)) - 0.5) * 4.0;
			double dark = hatching(x, y, -0.85, 3.6, 60.0, 0.7, 100) + hatching(x, y, 0.55, 4.4, 34.0, 0.42, 200);
			/* Graphite catches the paper's tooth: strokes break up on it. */
			double tooth = 0.7 + 0.3 * unit(hash2(uint32_t(x), uint32_t(y), 15));
			dark = std::fmin(0.85, dark * tooth);
			double v = paper * (1.0 - dark);
			double red = v * 1.0, green = v * 0.985, blue = v * 0.955 + dark * 18.0;
			unsigned char *p = &pixels[(size_t(y) * WIDTH + size_t(x)) * 3];
			p[0] = (unsigned char)std::lround(std::fmin(255.0, blue));
			p[1] = (unsigned char)std::lround(std::fmin(255.0, green));
			p[2] = (unsigned char)std::lround(std::fmin(255.0, red));
		}
	}
	FILE *file = std::fopen(argv[1], "wb");
	if (!file) {
		std::perror(argv[1]);
		return 1;
	}
	bool written = std::fwrite(pixels.data(), 1, pixels.size(), file) == pixels.size();
	if (std::fclose(file) != 0 || !written) {
		std::fprintf(stderr, "%s: write failed\n", argv[1]);
		std::remove(argv[1]);
		return 1;
	}
	return 0;
}
