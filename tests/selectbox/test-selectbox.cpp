/* The selection box over a stand-in picture whose geometry the test sets,
 * in a 720 x 1280 window: placement in each ratio mode, the member layout,
 * the remap after a real window rotation, and dragging with real mouse
 * events on the box. */
#include <ostream>

#include <platform_log.h>

#include "ie-selectbox-private.h"
#include "ie-test-harness.h"

namespace {

struct Box {
	int l, t, r, b;
	bool operator==(const Box &o) const { return l == o.l && t == o.t && r == o.r && b == o.b; }
};

std::ostream &operator<<(std::ostream &out, const Box &box)
{
	return out << "(" << box.l << ", " << box.t << ")-(" << box.r << ", " << box.b << ")";
}

struct Geometry {
	int x, y, w, h;
};

class SelectBox : public iet::EflTest {
protected:
	/* A stand-in for the picture's inner image object, and a shown box over
	 * the whole window in the free mode. Like the crop layout holding it,
	 * the box lets the touches through to the picture below. */
	void open(Geometry picture, bool free_mode = true)
	{
		picture_ = evas_object_image_filled_add(evas());
		evas_object_show(picture_);
		move_picture(picture);
		box_ = ie_selectbox_add(win());
		ASSERT_NE(box_, nullptr);
		evas_object_move(box_, 0, 0);
		evas_object_resize(box_, win_w, win_h);
		evas_object_repeat_events_set(box_, EINA_TRUE);
		ie_selectbox_set_image(box_, picture_);
		if (free_mode)
			ie_selectbox_set_ratio(box_, 0, 1);
		evas_object_show(box_);
		iet::settle();
	}
	void close()
	{
		evas_object_del(box_);
		evas_object_del(picture_);
		box_ = picture_ = nullptr;
	}
	void move_picture(Geometry g)
	{
		evas_object_move(picture_, g.x, g.y);
		evas_object_resize(picture_, g.w, g.h);
	}
	void rotate_window(int rotation, int w, int h)
	{
		elm_win_rotation_set(win(), rotation);
		resize_window(w, h);
	}
	Box region() const
	{
		Evas_Coord x, y, w, h;
		ie_selectbox_get_region(box_, &x, &y, &w, &h);
		return {x, y, x + w, y + h};
	}
	bool recalculation_requested() const { return evas_object_smart_need_recalculate_get(box_); }

	/* One finger down at (x, y), moved once by (dx, dy) and lifted. */
	void stroke(int x, int y, int dx, int dy)
	{
		iet::mouse_down(win(), x, y);
		iet::mouse_move(win(), x + dx, y + dy);
		iet::mouse_up(win(), x + dx, y + dy);
		iet::settle();
	}
	/* The bottom-right corner, taken just outside it so that no other part
	 * of a small box is nearer. */
	void drag_bottom_right(int dx, int dy)
	{
		Box b = region();
		stroke(b.r + 10, b.b + 10, dx, dy);
	}
	void drag_inside(int dx, int dy)
	{
		Box b = region();
		stroke((b.l + b.r) / 2, (b.t + b.b) / 2, dx, dy);
	}
	/* Brings a free-mode box to `target` by dragging: shrunk to 100 x 100,
	 * moved, then sized by its bottom-right corner. */
	void shape(Box target)
	{
		Box b = region();
		drag_bottom_right(b.l + 100 - b.r, b.t + 100 - b.b);
		drag_inside(target.l - b.l, target.t - b.t);
		drag_bottom_right(target.r - target.l - 100, target.b - target.t - 100);
		ASSERT_EQ(region(), target);
	}
	/* Lines, handles at their points - 9 and the four bands up to the
	 * canvas edges, all where the rectangle puts them. */
	void expect_members_follow(int canvas_w = 720, int canvas_h = 1280)
	{
		const Box b = region();
		Selectbox_Smart_Data *sd = _selectbox_data_get(box_);
		const Box lines[] = {{b.l, b.t, b.r, b.t}, {b.l, b.t, b.l, b.b}, {b.l, b.b, b.r, b.b}, {b.r, b.t, b.r, b.b}};
		for (int i = 0; i < LINE_COUNT; i++) {
			Box got;
			evas_object_line_xy_get(sd->lines[i], &got.l, &got.t, &got.r, &got.b);
			EXPECT_EQ(got, lines[i]) << "line " << i;
		}
		const int hw = (b.r - b.l) / 2, hh = (b.b - b.t) / 2;
		const int points[HANDLE_COUNT][2] = {{b.l, b.t}, {b.r, b.b}, {b.l, b.b}, {b.r, b.t},
						     {b.l, b.t + hh}, {b.r, b.t + hh}, {b.l + hw, b.b}, {b.l + hw, b.t}};
		for (int i = 0; i < HANDLE_COUNT; i++) {
			Evas_Coord x, y, w, h;
			evas_object_geometry_get(sd->handles[i], &x, &y, &w, &h);
			EXPECT_EQ(x, points[i][0] - 9) << "handle " << i;
			EXPECT_EQ(y, points[i][1] - 9) << "handle " << i;
			EXPECT_EQ(w, 18);
			EXPECT_EQ(h, 18);
		}
		const Geometry shades[] = {{0, 0, canvas_w, b.t}, {b.r, b.t, canvas_w - b.r, b.b - b.t},
					   {0, b.b, canvas_w, canvas_h - b.b}, {0, b.t, b.l, b.b - b.t}};
		for (int i = 0; i < SHADE_COUNT; i++) {
			Evas_Coord x, y, w, h;
			evas_object_geometry_get(sd->shades[i], &x, &y, &w, &h);
			EXPECT_EQ(x, shades[i].x) << "shade " << i;
			EXPECT_EQ(y, shades[i].y) << "shade " << i;
			EXPECT_EQ(w, shades[i].w) << "shade " << i;
			EXPECT_EQ(h, shades[i].h) << "shade " << i;
		}
	}
	bool handle_visible(int index) const
	{
		Selectbox_Smart_Data *sd = _selectbox_data_get(box_);
		return evas_object_visible_get(sd->handles[index]);
	}
	int visible_handles() const
	{
		int n = 0;
		for (int i = 0; i < HANDLE_COUNT; i++)
			n += handle_visible(i);
		return n;
	}

	Evas_Object *picture_ = nullptr;
	Evas_Object *box_ = nullptr;
};

struct Placement {
	const char *name;
	int rotation;
	Geometry picture;
	int ratio_h, ratio_w;
	Box expected;
};

TEST_F(SelectBox, NewRectangleIsPlacedByTheRatioMode)
{
	const Placement cases[] = {
		/* Free: 200 to each side of the screen's middle where the picture
		 * reaches the screen edge, a quarter of the picture otherwise. */
		{"free, full width", 0, {0, 100, 720, 540}, 0, 1, {160, 235, 560, 505}},
		{"free, 150 wide at x 20", 0, {20, 300, 150, 200}, 0, 1, {58, 350, 132, 450}},
		{"free, over the screen", 0, {-100, -50, 1500, 1400}, 0, 1, {160, 440, 560, 840}},
		{"free, any non-zero width term", 0, {20, 300, 150, 200}, 0, 7, {58, 350, 132, 450}},
		/* As wide as the screen: its middle in portrait, the picture's
		 * centre in landscape. */
		{"portrait, as wide as the screen", 0, {100, 40, 720, 600}, 0, 1, {180, 190, 540, 490}},
		{"landscape, as wide as the screen", 90, {100, 40, 1280, 600}, 0, 1, {420, 190, 1060, 490}},
		{"1:1, tall picture", 0, {60, 140, 600, 1000}, 1, 1, {260, 540, 460, 740}},
		{"1:1, low picture", 0, {60, 500, 600, 150}, 1, 1, {285, 500, 435, 650}},
		{"1:2, width-limited", 0, {210, 500, 300, 180}, 1, 2, {210, 515, 510, 665}},
		{"1:2, height-limited", 0, {210, 500, 300, 150}, 1, 2, {210, 500, 510, 650}},
		{"1:2, wide and low", 0, {60, 500, 600, 100}, 1, 2, {260, 500, 460, 600}},
	};
	for (const Placement &c : cases) {
		SCOPED_TRACE(c.name);
		if (c.rotation)
			rotate_window(c.rotation, 1280, 720);
		open(c.picture, false);
		ie_selectbox_set_ratio(box_, c.ratio_h, c.ratio_w);
		iet::settle();
		EXPECT_EQ(region(), c.expected);
		/* A fixed ratio has no edge handles. */
		EXPECT_EQ(visible_handles(), c.ratio_h ? 4 : 8);
		close();
		if (c.rotation)
			rotate_window(0, 720, 1280);
	}
}

TEST_F(SelectBox, SameRatioAgainKeepsTheUsersRectangle)
{
	open({0, 100, 720, 540});
	drag_inside(-30, 20);
	const Box moved = {130, 255, 530, 525};
	ASSERT_EQ(region(), moved);
	ie_selectbox_set_ratio(box_, 0, 1);
	iet::settle();
	EXPECT_EQ(region(), moved);

	/* (0, 0) fixes the ratio of the rectangle as it is. */
	ie_selectbox_set_ratio(box_, 0, 0);
	Selectbox_Smart_Data *sd = _selectbox_data_get(box_);
	EXPECT_TRUE(sd->fixed);
	EXPECT_EQ(sd->ratio_h, 270);
	EXPECT_EQ(sd->ratio_w, 400);
}

TEST_F(SelectBox, RatioWithoutAShapeIsRefused)
{
	/* A picture of no size gives an empty free rectangle: its own ratio
	 * is no ratio either. */
	for (Geometry picture : {Geometry{0, 100, 720, 540}, Geometry{10, 10, 0, 0}}) {
		open(picture);
		const Box before = region();
		const int pairs[][2] = {{3, 0}, {-1, 2}, {2, -3}, {0, 0}};
		for (const auto &pair : pairs) {
			if (pair[0] == 0 && before.r > before.l)
				continue;
			iet::log_clear();
			ie_selectbox_set_ratio(box_, pair[0], pair[1]);
			iet::settle();
			EXPECT_EQ(region(), before) << pair[0] << ":" << pair[1];
			EXPECT_EQ(visible_handles(), 8);
			/* (0, 0) takes the rectangle's own terms, 0 and 0 here. */
			EXPECT_EQ(iet::log_count("Invalid ratio " + std::to_string(pair[0]) + ":" + std::to_string(pair[1]),
						 PLATFORM_LOG_ERROR),
				  1);
		}
		Selectbox_Smart_Data *sd = _selectbox_data_get(box_);
		EXPECT_FALSE(sd->fixed);
		EXPECT_EQ(sd->ratio_w, 1);
		close();
	}
}

TEST_F(SelectBox, MembersFollowTheRectangleAndTheCanvasEdges)
{
	open({0, 100, 720, 540});
	expect_members_follow();

	/* The colour is the outline's; the shades keep their darkening. */
	Selectbox_Smart_Data *sd = _selectbox_data_get(box_);
	evas_object_color_set(box_, 10, 20, 30, 255);
	int r, g, bl, a;
	evas_object_color_get(sd->lines[LINE_RIGHT], &r, &g, &bl, &a);
	EXPECT_EQ(r + g + bl + a, 10 + 20 + 30 + 255);
	evas_object_color_get(sd->handles[HANDLE_TOP], &r, &g, &bl, &a);
	EXPECT_EQ(r + g + bl + a, 10 + 20 + 30 + 255);
	evas_object_color_get(sd->shades[SHADE_BELOW], &r, &g, &bl, &a);
	EXPECT_EQ(r + g + bl, 0);
	EXPECT_EQ(a, 102);
}

TEST_F(SelectBox, EveryLayoutLeavesEachMemberInPlace)
{
	/* Later layouts touch only what moved: whatever the drag, no member
	 * may be left where the previous rectangle had it. */
	open({60, 200, 600, 800});
	shape({200, 400, 400, 600});
	expect_members_follow();
	const struct {
		const char *what;
		int x, y, dx, dy;
	} strokes[] = {
		{"bottom-right corner, one pixel", 400, 600, 1, 1},
		{"bottom-right corner, odd size", 401, 601, 6, 0},
		{"top-left corner", 200, 400, -13, 7},
		{"right edge", 407, 504, 22, 0},
		{"bottom edge", 300, 601, 0, -9},
		{"inside", 300, 500, 17, -11},
		{"inside, back", 317, 489, -17, 11},
	};
	for (const auto &s : strokes) {
		SCOPED_TRACE(s.what);
		const Box before = region();
		stroke(s.x, s.y, s.dx, s.dy);
		ASSERT_FALSE(region() == before);
		expect_members_follow();
	}
	/* The bands follow the canvas as well. */
	resize_window(700, 1200);
	evas_object_resize(box_, 700, 1200);
	iet::settle();
	expect_members_follow(700, 1200);
}

TEST_F(SelectBox, SameGeometryRequestsNoRecalculation)
{
	open({0, 100, 720, 540});
	evas_object_move(box_, 0, 0);
	evas_object_resize(box_, 720, 1280);
	EXPECT_FALSE(recalculation_requested());
	evas_object_resize(box_, 720, 1000);
	EXPECT_TRUE(recalculation_requested());
}

TEST_F(SelectBox, ShowBringsBackTheHandlesAFixedRatioHid)
{
	open({0, 100, 720, 540});
	ie_selectbox_set_ratio(box_, 1, 1);
	EXPECT_EQ(visible_handles(), 4);
	EXPECT_FALSE(handle_visible(HANDLE_TOP));
	evas_object_hide(box_);
	EXPECT_EQ(visible_handles(), 0);
	evas_object_show(box_);
	EXPECT_EQ(visible_handles(), 8);
}

struct Remap {
	const char *name;
	int ratio_h, ratio_w;
	Box before;
	int rotation, win_w, win_h;
	Geometry picture;
	Box expected;
};

TEST_F(SelectBox, WindowRotationMapsTheRectangleOntoThePicturesNewPlace)
{
	const Remap cases[] = {
		{"same scale", 0, 1, {100, 380, 460, 740}, 90, 1280, 720, {280, 0, 720, 720}, {380, 100, 740, 460}},
		{"raised to the free minimum", 0, 1, {100, 380, 160, 420}, 90, 1280, 720, {460, 180, 360, 360},
		 {510, 230, 550, 270}},
		{"raised to the 3:4 minimum", 3, 4, {100, 380, 300, 530}, 90, 1280, 720, {460, 180, 360, 360},
		 {510, 230, 644, 330}},
		{"beyond the screen width", 0, 1, {600, 380, 700, 480}, 180, 720, 1280, {0, 0, 900, 900},
		 {360, 125, 485, 250}},
		/* Never past the screen's right or bottom edge. */
		{"cut at the right edge", 0, 1, {400, 380, 700, 480}, 180, 720, 1280, {0, 0, 1500, 1500},
		 {360, 208, 720, 416}},
		{"cut at the bottom edge", 0, 1, {100, 856, 200, 956}, 180, 720, 1280, {0, 0, 1500, 1500},
		 {208, 1200, 416, 1280}},
	};
	for (const Remap &c : cases) {
		SCOPED_TRACE(c.name);
		open({0, 280, 720, 720});
		shape(c.before);
		if (c.ratio_h) {
			/* Placed 266 x 198 in the middle; three diagonal drags make it
			 * 200 x 150 (each vertical step truncated), then it is moved. */
			ie_selectbox_set_ratio(box_, c.ratio_h, c.ratio_w);
			iet::settle();
			for (int dx : {-62, -2, -2})
				drag_bottom_right(dx, 0);
			Box b = region();
			drag_inside(c.before.l - b.l, c.before.t - b.t);
			ASSERT_EQ(region(), c.before);
		}
		rotate_window(c.rotation, c.win_w, c.win_h);
		move_picture(c.picture);
		ie_selectbox_rotate(box_);
		iet::settle();
		EXPECT_EQ(region(), c.expected);
		close();
		rotate_window(0, 720, 1280);
	}
}

TEST_F(SelectBox, RotationFromAnEmptyAreaKeepsTheRectangleOnThePicture)
{
	/* The box met the picture before it had a size. */
	open({0, 0, 0, 0}, false);
	move_picture({0, 280, 720, 720});
	ie_selectbox_set_ratio(box_, 0, 1);
	iet::settle();
	ASSERT_EQ(region(), (Box{160, 460, 560, 820}));
	rotate_window(90, 1280, 720);
	move_picture({460, 180, 360, 360});
	ie_selectbox_rotate(box_);
	iet::settle();
	/* Its size kept but no larger than the picture, centred on it. */
	EXPECT_EQ(region(), (Box{460, 180, 820, 540}));

	/* Left of and above the recorded area, it starts at the picture's
	 * corner. */
	rotate_window(0, 720, 1280);
	close();
	open({0, 280, 720, 720});
	shape({100, 380, 200, 480});
	move_picture({150, 400, 400, 400});
	ie_selectbox_set_image(box_, picture_);
	move_picture({0, 100, 800, 800});
	ie_selectbox_rotate(box_);
	iet::settle();
	EXPECT_EQ(region(), (Box{0, 100, 200, 300}));
}

TEST_F(SelectBox, GrabToleranceAndHandleOrder)
{
	open({60, 200, 600, 800});
	shape({200, 400, 400, 600});
	/* 29 pixels from the top-left corner takes the corner ... */
	stroke(229, 429, 10, 10);
	EXPECT_EQ(region(), (Box{210, 410, 400, 600}));
	/* ... 30 pixels does not: the inside moves the whole box. */
	stroke(240, 440, 10, 10);
	EXPECT_EQ(region(), (Box{220, 420, 410, 610}));

	/* On a box 40 wide the corner is tested before the top middle, and
	 * the top middle before the top-right corner. */
	shape({200, 400, 240, 600});
	stroke(210, 400, -10, -10);
	EXPECT_EQ(region(), (Box{190, 390, 240, 600}));
	shape({200, 400, 240, 600});
	stroke(230, 400, 10, -10);
	EXPECT_EQ(region(), (Box{200, 390, 240, 600}));
}

TEST_F(SelectBox, FreeModeEdgesSnapAndTheBoxStaysOnThePicture)
{
	open({60, 200, 600, 800});
	/* An edge dragged below the minimum snaps to 40, and stays there. */
	shape({200, 400, 260, 600});
	iet::mouse_down(win(), 260, 500);
	iet::mouse_move(win(), 230, 500);
	iet::settle();
	EXPECT_EQ(region(), (Box{200, 400, 240, 600}));
	iet::mouse_move(win(), 225, 500);
	iet::mouse_up(win(), 225, 500);
	iet::settle();
	EXPECT_EQ(region(), (Box{200, 400, 240, 600}));

	/* Dragged against the picture's right edge it stops flush, same size;
	 * pushed on against it, nothing changes and nothing is laid out. */
	shape({200, 400, 400, 600});
	drag_inside(1000, 0);
	EXPECT_EQ(region(), (Box{460, 400, 660, 600}));
	iet::mouse_down(win(), 560, 500);
	iet::settle();
	iet::mouse_move(win(), 580, 500);
	EXPECT_FALSE(recalculation_requested());
	iet::mouse_up(win(), 580, 500);
	iet::settle();
	EXPECT_EQ(region(), (Box{460, 400, 660, 600}));

	/* The bottom-right corner grows by the finger's movement, but not past
	 * the picture's bottom. */
	shape({200, 400, 400, 600});
	drag_bottom_right(10, 5);
	EXPECT_EQ(region(), (Box{200, 400, 410, 605}));
	shape({200, 800, 400, 1000});
	drag_bottom_right(10, 5);
	EXPECT_EQ(region(), (Box{200, 800, 410, 1000}));
}

TEST_F(SelectBox, FixedRatioCornersKeepTheRatio)
{
	open({60, 200, 600, 800});
	ie_selectbox_set_ratio(box_, 1, 1);
	iet::settle();
	ASSERT_EQ(region(), (Box{260, 500, 460, 700}));
	/* The vertical movement follows the horizontal one. */
	drag_bottom_right(10, 3);
	EXPECT_EQ(region(), (Box{260, 500, 470, 710}));

	/* Against the picture's bottom the drag is refused outright. */
	drag_inside(0, 1000);
	const Box at_bottom = {260, 790, 470, 1000};
	ASSERT_EQ(region(), at_bottom);
	iet::mouse_down(win(), 480, 1010);
	iet::settle();
	iet::mouse_move(win(), 490, 1013);
	EXPECT_FALSE(recalculation_requested());
	iet::mouse_up(win(), 490, 1013);
	iet::settle();
	EXPECT_EQ(region(), at_bottom);

	/* 3:4: the height follows at 3/4 of the width, truncated toward zero. */
	ie_selectbox_set_ratio(box_, 3, 4);
	iet::settle();
	ASSERT_EQ(region(), (Box{227, 501, 493, 699}));
	for (int dx : {-62, -2, -2})
		drag_bottom_right(dx, 0);
	ASSERT_EQ(region(), (Box{227, 501, 427, 651}));
	drag_bottom_right(10, 0);
	EXPECT_EQ(region(), (Box{227, 501, 437, 658}));
	drag_bottom_right(-10, 0);
	drag_bottom_right(-10, 0);
	EXPECT_EQ(region(), (Box{227, 501, 417, 644}));

	/* At its minimum of 134 x 100 a shrinking drag is refused. */
	ie_selectbox_set_ratio(box_, 0, 1);
	ie_selectbox_set_ratio(box_, 3, 4);
	iet::settle();
	for (int dx : {-128, -2, -2})
		drag_bottom_right(dx, 0);
	const Box smallest = {227, 501, 361, 601};
	ASSERT_EQ(region(), smallest);
	iet::mouse_down(win(), 371, 611);
	iet::settle();
	iet::mouse_move(win(), 367, 611);
	EXPECT_FALSE(recalculation_requested());
	iet::mouse_up(win(), 367, 611);
	iet::settle();
	EXPECT_EQ(region(), smallest);
}

TEST_F(SelectBox, FixedRatioTopRightCornerAndEdges)
{
	open({50, 50, 300, 300});
	ie_selectbox_set_ratio(box_, 1, 1);
	iet::settle();
	ASSERT_EQ(region(), (Box{100, 100, 300, 300}));
	/* Whatever the finger does vertically, the corner goes out along the
	 * diagonal. */
	stroke(300, 100, 10, 25);
	EXPECT_EQ(region(), (Box{100, 90, 310, 300}));

	/* Without edge handles an edge taken moves the whole box. */
	close();
	open({60, 200, 600, 800});
	ie_selectbox_set_ratio(box_, 1, 1);
	iet::settle();
	stroke(360, 500, 20, 30);
	EXPECT_EQ(region(), (Box{280, 530, 480, 730}));
	stroke(480, 630, -20, 10);
	EXPECT_EQ(region(), (Box{260, 540, 460, 740}));
}

TEST_F(SelectBox, PinchOnABoxWithoutARatioKeepsItSquare)
{
	/* A box never given a ratio, raised to 40 x 40 by a rotation over a
	 * picture 30 wide: the pinch must not divide by its zero terms. */
	open({100, 100, 30, 30}, false);
	ie_selectbox_rotate(box_);
	iet::settle();
	ASSERT_EQ(region(), (Box{90, 90, 130, 130}));
	iet::finger_down(win(), 0, 110, 110);
	iet::finger_down(win(), 1, 120, 120);
	iet::finger_move(win(), 1, 125, 125);
	iet::finger_up(win(), 1, 125, 125);
	iet::finger_up(win(), 0, 110, 110);
	iet::settle();
	EXPECT_EQ(region(), (Box{100, 100, 115, 115}));
}

} // namespace
