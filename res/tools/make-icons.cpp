/* Draws the editor's tool-bar icons and the crop handle as PNG files.
 *
 * Shapes are described as distance fields (segments, arcs, discs), so the
 * output is antialiased and identical on every run. Icons are white on a
 * transparent background: the theme tints them through clippers, and the
 * crop handle is tinted by the selection box's colour. */
#include <png.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <string>
#include <vector>

namespace {

constexpr double kPi = 3.14159265358979323846;

struct Canvas {
	int w, h;
	std::vector<unsigned char> rgba;

	Canvas(int width, int height) : w(width), h(height), rgba(static_cast<size_t>(width) * height * 4, 0) {}

	/* Composites `r,g,b` over the pixel with coverage `a` (0..1). */
	void blend(int x, int y, double a, int r, int g, int b)
	{
		if (a <= 0.0)
			return;
		a = std::min(a, 1.0);
		unsigned char *p = &rgba[(static_cast<size_t>(y) * w + x) * 4];
		double da = p[3] / 255.0;
		double oa = a + da * (1.0 - a);
		auto mix = [&](int src, unsigned char dst) {
			return static_cast<unsigned char>(std::lround((src * a + dst * da * (1.0 - a)) / oa));
		};
		p[0] = mix(r, p[0]);
		p[1] = mix(g, p[1]);
		p[2] = mix(b, p[2]);
		p[3] = static_cast<unsigned char>(std::lround(oa * 255.0));
	}

	/* Fills every pixel whose centre lies inside the shape given by its
	 * signed distance (negative inside), with a one-pixel soft edge. */
	void fill(const std::function<double(double, double)> &distance, int r = 255, int g = 255, int b = 255)
	{
		for (int y = 0; y < h; y++)
			for (int x = 0; x < w; x++)
				blend(x, y, 0.5 - distance(x + 0.5, y + 0.5), r, g, b);
	}
};

double segment_distance(double px, double py, double ax, double ay, double bx, double by)
{
	double vx = bx - ax, vy = by - ay;
	double t = ((px - ax) * vx + (py - ay) * vy) / (vx * vx + vy * vy);
	t = std::clamp(t, 0.0, 1.0);
	return std::hypot(px - (ax + t * vx), py - (ay + t * vy));
}

/* A stroked polyline with round joins and caps. */
void stroke(Canvas &c, const std::vector<std::pair<double, double>> &points, double width)
{
	c.fill([&](double x, double y) {
		double d = 1e9;
		for (size_t i = 1; i < points.size(); i++)
			d = std::min(d, segment_distance(x, y, points[i - 1].first, points[i - 1].second,
							 points[i].first, points[i].second));
		return d - width / 2.0;
	});
}

/* A stroked circular arc from angle a0 to a1 (radians, counter-clockwise
 * on screen means decreasing y), with round caps. */
void arc(Canvas &c, double cx, double cy, double radius, double a0, double a1, double width)
{
	std::vector<std::pair<double, double>> points;
	const int steps = 96;
	for (int i = 0; i <= steps; i++) {
		double a = a0 + (a1 - a0) * i / steps;
		points.emplace_back(cx + radius * std::cos(a), cy - radius * std::sin(a));
	}
	stroke(c, points, width);
}

double triangle_distance(double px, double py, const double v[6])
{
	double d = 1e9;
	bool inside = true;
	for (int i = 0; i < 3; i++) {
		int j = (i + 1) % 3;
		d = std::min(d, segment_distance(px, py, v[2 * i], v[2 * i + 1], v[2 * j], v[2 * j + 1]));
		double cross = (v[2 * j] - v[2 * i]) * (py - v[2 * i + 1]) - (v[2 * j + 1] - v[2 * i + 1]) * (px - v[2 * i]);
		if (cross < 0)
			inside = false;
	}
	return inside ? -d : d;
}

/* Filled arrow head with its tip at (tx, ty), pointing along the unit
 * vector (dx, dy). */
void arrow_head(Canvas &c, double tx, double ty, double dx, double dy, double length, double half_width)
{
	double bx = tx - dx * length, by = ty - dy * length;
	double v[6] = {tx, ty, bx - dy * half_width, by + dx * half_width, bx + dy * half_width, by - dx * half_width};
	/* Keep a consistent winding so the inside test holds either way. */
	double cross = (v[2] - v[0]) * (v[5] - v[1]) - (v[3] - v[1]) * (v[4] - v[0]);
	if (cross < 0) {
		std::swap(v[2], v[4]);
		std::swap(v[3], v[5]);
	}
	c.fill([&](double x, double y) { return triangle_distance(x, y, v); });
}

void draw_crop(Canvas &c)
{
	stroke(c, {{18, 6}, {18, 46}, {58, 46}}, 5);
	stroke(c, {{6, 18}, {46, 18}, {46, 58}}, 5);
}

/* A three-quarter turn ending in an arrow; `mirror` draws the clockwise one. */
void draw_rotation(Canvas &c, bool mirror)
{
	Canvas shape(c.w, c.h);
	const double cx = 32, cy = 35, radius = 19;
	const double start = -0.25 * kPi, end = 1.05 * kPi;
	arc(shape, cx, cy, radius, start, end, 5);
	/* Tangent at the arc's end, continuing counter-clockwise on screen. */
	double dx = -std::sin(end), dy = -std::cos(end);
	double ex = cx + radius * std::cos(end), ey = cy - radius * std::sin(end);
	arrow_head(shape, ex + dx * 9, ey + dy * 9, dx, dy, 15, 9);
	/* A small page in the middle tells rotation from undo. */
	stroke(shape, {{27, 30}, {37, 30}, {37, 40}, {27, 40}, {27, 30}}, 3);
	for (int y = 0; y < c.h; y++)
		for (int x = 0; x < c.w; x++) {
			int sx = mirror ? c.w - 1 - x : x;
			const unsigned char *p = &shape.rgba[(static_cast<size_t>(y) * c.w + sx) * 4];
			c.blend(x, y, p[3] / 255.0, p[0], p[1], p[2]);
		}
}

/* A magic wand with sparkles. */
void draw_effect(Canvas &c)
{
	stroke(c, {{10, 54}, {38, 26}}, 6);
	auto sparkle = [&](double x, double y, double r) {
		stroke(c, {{x - r, y}, {x + r, y}}, 3.5);
		stroke(c, {{x, y - r}, {x, y + r}}, 3.5);
	};
	sparkle(46, 18, 9);
	sparkle(26, 12, 5);
	sparkle(52, 40, 5);
}

/* The crop corner handle: a white rounded square with a dark rim, so it
 * stays visible over light pictures once tinted. */
void draw_crop_handle(Canvas &c)
{
	auto rounded_square = [](double x, double y, double centre, double half, double radius) {
		double qx = std::fabs(x - centre) - (half - radius);
		double qy = std::fabs(y - centre) - (half - radius);
		double outside = std::hypot(std::max(qx, 0.0), std::max(qy, 0.0));
		return outside + std::min(std::max(qx, qy), 0.0) - radius;
	};
	c.fill([&](double x, double y) { return rounded_square(x, y, 9, 8, 3); }, 40, 40, 40);
	c.fill([&](double x, double y) { return rounded_square(x, y, 9, 6.5, 2); });
}

bool write_png(const std::string &path, const Canvas &c)
{
	FILE *f = std::fopen(path.c_str(), "wb");
	if (!f)
		return false;
	png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
	png_infop info = png ? png_create_info_struct(png) : nullptr;
	if (!info || setjmp(png_jmpbuf(png))) {
		png_destroy_write_struct(&png, info ? &info : nullptr);
		std::fclose(f);
		return false;
	}
	png_init_io(png, f);
	png_set_IHDR(png, info, c.w, c.h, 8, PNG_COLOR_TYPE_RGBA, PNG_INTERLACE_NONE, PNG_COMPRESSION_TYPE_DEFAULT,
		     PNG_FILTER_TYPE_DEFAULT);
	png_write_info(png, info);
	for (int y = 0; y < c.h; y++)
		png_write_row(png, &c.rgba[static_cast<size_t>(y) * c.w * 4]);
	png_write_end(png, nullptr);
	png_destroy_write_struct(&png, &info);
	return std::fclose(f) == 0;
}

} // namespace

int main(int argc, char **argv)
{
	if (argc != 2) {
		std::fprintf(stderr, "usage: %s OUTPUT_DIR\n", argv[0]);
		return 2;
	}
	const std::string dir = std::string(argv[1]) + "/";
	struct Icon {
		const char *name;
		int size;
		std::function<void(Canvas &)> draw;
	} icons[] = {
		{"image_viewer_btn_ic_crop.png", 64, draw_crop},
		{"image_viewer_btn_ic_rotation_left.png", 64, [](Canvas &c) { draw_rotation(c, false); }},
		{"image_viewer_btn_ic_rotation_right.png", 64, [](Canvas &c) { draw_rotation(c, true); }},
		{"image_viewer_btn_ic_effect.png", 64, draw_effect},
		{"image_viewer_crop_rectanglel.png", 18, draw_crop_handle},
	};
	for (const Icon &icon : icons) {
		Canvas canvas(icon.size, icon.size);
		icon.draw(canvas);
		if (!write_png(dir + icon.name, canvas)) {
			std::fprintf(stderr, "cannot write %s%s\n", dir.c_str(), icon.name);
			return 1;
		}
	}
	return 0;
}
