/* A window with one main image object in it, as the editor places it: the
 * window is the parent, the object is moved and resized to an area. */
#ifndef IE_TEST_IMAGE_FIXTURE_H
#define IE_TEST_IMAGE_FIXTURE_H

#include <ie-test-harness.h>

#include <ostream>
#include <string>

#include "ie-image-private.h"

namespace iet {

struct Rect {
	int x, y, w, h;
	bool operator==(const Rect &o) const { return x == o.x && y == o.y && w == o.w && h == o.h; }
};

inline std::ostream &operator<<(std::ostream &os, const Rect &r)
{
	return os << "(" << r.x << ", " << r.y << ", " << r.w << "x" << r.h << ")";
}

class MainImageTest : public EflTest {
protected:
	void TearDown() override
	{
		if (obj_)
			evas_object_del(obj_);
		EflTest::TearDown();
	}

	/* Replaces any earlier object. */
	Evas_Object *add_image(int x = 0, int y = 0, int w = 720, int h = 1280)
	{
		if (obj_)
			evas_object_del(obj_);
		obj_ = ie_image_add(win());
		evas_object_move(obj_, x, y);
		evas_object_resize(obj_, w, h);
		return obj_;
	}

	Mainimg_Smart_Data *sd() const { return _mainimg_data_get(obj_); }

	Rect shown() const
	{
		Rect r{};
		ie_image_geometry_get(obj_, &r.x, &r.y, &r.w, &r.h);
		return r;
	}

	Rect pixel_size() const
	{
		Rect r{};
		evas_object_image_size_get(ie_image_object_get(obj_), &r.w, &r.h);
		return r;
	}

	std::string scratch_path(const std::string &name)
	{
		if (dir_.empty())
			dir_ = temp_dir();
		return dir_ + "/" + name;
	}

	std::string picture(const std::string &name, int w, int h)
	{
		std::string path = scratch_path(name);
		EXPECT_TRUE(write_picture(path, w, h)) << path;
		return path;
	}

	Evas_Object *obj_ = nullptr;
	std::string dir_;
};

} // namespace iet

#endif
