#include <algorithm>
#include <cairo.h>
#include <cmath>
#include <fcntl.h>
#include <memory>
#include <poppler.h>
#include <unistd.h>

#include "keld/thumbnails/maker/Makers.h"

namespace droxa::keld {

namespace {

struct Unref {
  void operator()(void *object) const { g_object_unref(object); }
};

struct Canvas {
  std::unique_ptr<cairo_surface_t, decltype(&cairo_surface_destroy)> surface;
  std::unique_ptr<cairo_t, decltype(&cairo_destroy)> pen;
};

Canvas whitePaper(int width, int height) {
  cairo_surface_t *surface = cairo_image_surface_create(CAIRO_FORMAT_RGB24, width, height);
  Canvas canvas{{surface, &cairo_surface_destroy}, {cairo_create(surface), &cairo_destroy}};
  if (cairo_status(canvas.pen.get()) != CAIRO_STATUS_SUCCESS) throw std::bad_alloc();
  cairo_set_source_rgb(canvas.pen.get(), 1, 1, 1);
  cairo_paint(canvas.pen.get());
  return canvas;
}

cairo_status_t append(void *text, const unsigned char *bytes, unsigned size) {
  static_cast<std::string *>(text)->append(reinterpret_cast<const char *>(bytes), size);
  return CAIRO_STATUS_SUCCESS;
}

std::unique_ptr<PopplerPage, Unref> firstPage(PopplerDocument *document) {
  PopplerPage *page =
      poppler_document_get_n_pages(document) > 0 ? poppler_document_get_page(document, 0) : nullptr;
  if (!page) throw MakerRefusal("it has no first page");
  return std::unique_ptr<PopplerPage, Unref>(page);
}

}  // namespace

std::string MakePageThumbnail(const MakerJob &job) {
  GError *error = nullptr;
  const std::unique_ptr<PopplerDocument, Unref> document(
      poppler_document_new_from_fd(::fcntl(job.contents, F_DUPFD_CLOEXEC, 0), nullptr, &error));
  if (!document) {
    const std::string why = error ? error->message : "it can't be read";
    g_clear_error(&error);
    throw MakerRefusal(why);
  }
  const auto page = firstPage(document.get());
  double width = 0, height = 0;
  poppler_page_get_size(page.get(), &width, &height);
  const bool hasSize = std::isfinite(width) && std::isfinite(height) && width > 0 && height > 0;
  if (!hasSize) throw MakerRefusal("its first page has no size");
  const double side = kThumbnailSide, scale = side / std::max(width, height);
  const auto pixels = [&](double length) {
    return static_cast<int>(std::clamp(std::round(length * scale), 1.0, side));
  };
  const Canvas canvas = whitePaper(pixels(width), pixels(height));
  cairo_scale(canvas.pen.get(), scale, scale);
  poppler_page_render(page.get(), canvas.pen.get());
  std::string png;
  if (cairo_status(canvas.pen.get()) != CAIRO_STATUS_SUCCESS ||
      cairo_surface_write_to_png_stream(canvas.surface.get(), &append, &png) != CAIRO_STATUS_SUCCESS)
    throw MakerRefusal("its first page can't be drawn");
  return png;
}

}  // namespace droxa::keld
