#include "editor-fixture.h"

#include "ie-image.h"

void EditorTest::on_delete_me(void *data, Evas_Object *, void *event_info)
{
	auto *self = static_cast<EditorTest *>(data);
	auto *path = static_cast<char *>(event_info);
	self->close_requests.push_back(path ? path : "");
	free(path);
}

Viewhandle *EditorTest::create_editor()
{
	box_ = elm_box_add(win());
	evas_object_size_hint_weight_set(box_, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	elm_win_resize_object_add(win(), box_);
	evas_object_show(box_);
	vh = IE_create(box_);
	if (vh) {
		evas_object_smart_callback_add(IE_get_view_object(vh), "delete,me", on_delete_me, this);
		elm_box_pack_end(box_, IE_get_view_object(vh));
	}
	iet::settle();
	return vh;
}

Viewhandle *EditorTest::open_editor_on_picture(int w, int h, int rotation)
{
	picture_dir = iet::temp_dir();
	if (!iet::write_picture(picture_dir + "/photo.jpg", w, h, "quality=100"))
		return nullptr;
	return open_editor_on_file(picture_dir + "/photo.jpg", rotation);
}

Viewhandle *EditorTest::open_editor_on_file(const std::string &path, int rotation)
{
	picture_path = path;
	picture_dir = path.substr(0, path.rfind('/'));
	if (!create_editor())
		return nullptr;
	IE_setparam(vh, picture_path.c_str(), win_w, win_h, rotation);
	iet::run_until([this] {
		int pw = 0, ph = 0;
		picture_size(&pw, &ph);
		return pw > 0 && evas_object_image_data_get(inner_image(), EINA_FALSE) != nullptr;
	});
	iet::run_idlers();
	return vh;
}

Elm_Object_Item *EditorTest::tool(int index) const
{
	Elm_Object_Item *item = elm_gengrid_first_item_get(vh->toolbar);
	for (int i = 0; item && i < index; i++)
		item = elm_gengrid_item_next_get(item);
	return item;
}

void EditorTest::tap_item(Elm_Object_Item *item)
{
	iet::settle();
	ASSERT_NE(item, nullptr);
	Evas_Object *track = elm_object_item_track(item);
	int x, y;
	iet::object_centre(track, &x, &y);
	elm_object_item_untrack(item);
	iet::tap(win(), x, y);
}

void EditorTest::destroy_editor()
{
	if (vh) {
		IE_destroy(vh);
		vh = nullptr;
	}
	iet::run_idlers();
}

bool EditorTest::wait_for_close(double timeout)
{
	return iet::run_until([this] { return !close_requests.empty(); }, timeout);
}

void EditorTest::TearDown()
{
	destroy_editor();
	iet::EflTest::TearDown();
}

Evas_Object *EditorTest::inner_image() const
{
	return vh && vh->main_image ? ie_image_object_get(vh->main_image) : nullptr;
}

void EditorTest::picture_size(int *w, int *h) const
{
	*w = *h = 0;
	if (inner_image())
		evas_object_image_size_get(inner_image(), w, h);
}

std::vector<uint32_t> EditorTest::picture_pixels() const
{
	int w, h;
	picture_size(&w, &h);
	auto *data = static_cast<const uint32_t *>(evas_object_image_data_get(inner_image(), EINA_FALSE));
	if (!data)
		return {};
	return std::vector<uint32_t>(data, data + static_cast<size_t>(w) * h);
}
