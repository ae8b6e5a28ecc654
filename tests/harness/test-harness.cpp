/* The harness feeds input the way the toolkit expects it: if these fail,
 * every UI test downstream is suspect. */
#include "ie-test-harness.h"

namespace {

class Harness : public iet::EflTest {};

TEST_F(Harness, TapClicksARealButton)
{
	Evas_Object *button = elm_button_add(win());
	elm_object_text_set(button, "Tap");
	evas_object_resize(button, 200, 80);
	evas_object_move(button, 100, 100);
	evas_object_show(button);
	int clicks = 0;
	evas_object_smart_callback_add(button, "clicked", [](void *data, Evas_Object *, void *) {
		++*static_cast<int *>(data);
	}, &clicks);
	iet::tap_object(button);
	EXPECT_EQ(clicks, 1);
}

struct Gestures {
	int double_taps = 0;
	int zoom_moves = 0;
	double last_zoom = 0;
	int momentum_moves = 0;
};

TEST_F(Harness, GesturesReachTheGestureLayer)
{
	Evas_Object *rect = evas_object_rectangle_add(evas());
	evas_object_color_set(rect, 0, 0, 0, 255);
	evas_object_resize(rect, 600, 600);
	evas_object_move(rect, 60, 300);
	evas_object_show(rect);
	Evas_Object *layer = elm_gesture_layer_add(win());
	elm_gesture_layer_hold_events_set(layer, EINA_FALSE);
	Gestures seen;
	elm_gesture_layer_cb_set(layer, ELM_GESTURE_N_DOUBLE_TAPS, ELM_GESTURE_STATE_END,
		[](void *data, void *) -> Evas_Event_Flags {
			static_cast<Gestures *>(data)->double_taps++;
			return EVAS_EVENT_FLAG_NONE;
		}, &seen);
	elm_gesture_layer_cb_set(layer, ELM_GESTURE_ZOOM, ELM_GESTURE_STATE_MOVE,
		[](void *data, void *info) -> Evas_Event_Flags {
			auto *g = static_cast<Gestures *>(data);
			g->zoom_moves++;
			g->last_zoom = static_cast<Elm_Gesture_Zoom_Info *>(info)->zoom;
			return EVAS_EVENT_FLAG_NONE;
		}, &seen);
	elm_gesture_layer_cb_set(layer, ELM_GESTURE_MOMENTUM, ELM_GESTURE_STATE_MOVE,
		[](void *data, void *) -> Evas_Event_Flags {
			static_cast<Gestures *>(data)->momentum_moves++;
			return EVAS_EVENT_FLAG_NONE;
		}, &seen);
	ASSERT_TRUE(elm_gesture_layer_attach(layer, rect));

	iet::double_tap(win(), 300, 500);
	EXPECT_EQ(seen.double_taps, 1);

	iet::pinch(win(), 360, 600, 80, 240);
	EXPECT_GT(seen.zoom_moves, 0);
	EXPECT_GT(seen.last_zoom, 1.5);

	iet::drag(win(), 200, 500, 400, 500);
	EXPECT_GT(seen.momentum_moves, 0);
}

TEST_F(Harness, RunIdlersRunsIdlersAndTheirFollowers)
{
	int ran = 0;
	ecore_idler_add([](void *data) -> Eina_Bool {
		++*static_cast<int *>(data);
		ecore_idler_add([](void *d) -> Eina_Bool {
			++*static_cast<int *>(d);
			return ECORE_CALLBACK_CANCEL;
		}, data);
		return ECORE_CALLBACK_CANCEL;
	}, &ran);
	iet::run_idlers();
	EXPECT_EQ(ran, 2);
}

} // namespace
