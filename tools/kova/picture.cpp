// SPDX-License-Identifier: Apache-2.0
#include "picture.h"

#include <cairo.h>
#include <fftw3.h>
#include <fontconfig/fontconfig.h>
#include <kova/kova_types.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <numbers>

#include "cli.h"
#include "output_file.h"

namespace kova_tool {
namespace {

struct Rgb {
    double r, g, b;
};

constexpr Rgb kBackground{0.086, 0.094, 0.114};
constexpr Rgb kPanel{0.118, 0.129, 0.153};
constexpr Rgb kText{0.85, 0.87, 0.90};
constexpr Rgb kGrid{0.25, 0.27, 0.31};
constexpr Rgb kWave{0.35, 0.69, 1.0};
constexpr Rgb kStartColour{0.30, 0.80, 0.45};
constexpr Rgb kLoopColour{0.35, 0.55, 0.95};
constexpr Rgb kEndColour{0.98, 0.60, 0.25};

constexpr double kFloorDb = -100.0; /* bottom of the spectrogram's colour scale, dB full scale */

struct Layout {
    double left = 70, right = 20, top = 44, bottom = 36;
    double plot_w = 0, strip_y = 0, strip_h = 8, wave_y = 0, wave_h = 0, spectro_y = 0,
           spectro_h = 0;
};

Layout layout(uint32_t w, uint32_t h) {
    Layout l;
    l.plot_w = w - l.left - l.right;
    const double avail = h - l.top - l.bottom;
    const double gap = 14;
    l.strip_y = l.top;
    l.wave_y = l.strip_y + l.strip_h + 4;
    l.wave_h = std::floor((avail - l.strip_h - 4 - gap) * 0.4);
    l.spectro_y = l.wave_y + l.wave_h + gap;
    l.spectro_h = std::floor(l.top + avail - l.spectro_y);
    return l;
}

void colour(cairo_t* cr, Rgb c, double alpha = 1.0) {
    cairo_set_source_rgba(cr, c.r, c.g, c.b, alpha);
}

void text(cairo_t* cr, double x, double y, const std::string& s, double size, Rgb c,
          double align = 0.0) {
    cairo_set_font_size(cr, size);
    cairo_text_extents_t ext{};
    cairo_text_extents(cr, s.c_str(), &ext);
    colour(cr, c);
    cairo_move_to(cr, x - align * ext.x_advance, y);
    cairo_show_text(cr, s.c_str());
}

/* Magma-like scale from black through purple and orange to pale yellow; v in 0..1. */
Rgb heat(double v) {
    static constexpr Rgb stops[] = {{0.00, 0.00, 0.02}, {0.23, 0.06, 0.44}, {0.55, 0.16, 0.51},
                                    {0.87, 0.29, 0.41}, {0.99, 0.62, 0.43}, {0.99, 0.99, 0.75}};
    constexpr int n = sizeof stops / sizeof stops[0];
    v = std::clamp(v, 0.0, 1.0) * (n - 1);
    const int i = std::min(static_cast<int>(v), n - 2);
    const double f = v - i;
    return {stops[i].r + f * (stops[i + 1].r - stops[i].r),
            stops[i].g + f * (stops[i + 1].g - stops[i].g),
            stops[i].b + f * (stops[i + 1].b - stops[i].b)};
}

/* A tick step from 1, 2, 5 x 10^k giving at most `max_ticks` ticks over `span`. */
double nice_step(double span, int max_ticks) {
    const double raw = span / max_ticks;
    const double p = std::pow(10.0, std::floor(std::log10(raw)));
    for (double m : {1.0, 2.0, 5.0, 10.0}) {
        if (m * p >= raw) return m * p;
    }
    return 10.0 * p;
}

std::string tick_label(double v, double step) {
    char buf[32];
    const int decimals = step >= 1.0 ? 0 : static_cast<int>(std::ceil(-std::log10(step) - 1e-9));
    std::snprintf(buf, sizeof buf, "%.*f", decimals, v);
    return buf;
}

void draw_segments(cairo_t* cr, const Layout& l, const std::vector<Segment>& blocks,
                   double frames) {
    // Blocks of one action that follow each other without a gap form one band.
    std::vector<Segment> segs;
    for (const Segment& b : blocks) {
        if (!segs.empty() && segs.back().action == b.action &&
            segs.back().first + segs.back().frames == b.first) {
            segs.back().frames += b.frames;
        } else {
            segs.push_back(b);
        }
    }
    for (const Segment& s : segs) {
        const Rgb c = s.action == KOVA_ACTION_START ? kStartColour
                      : s.action == KOVA_ACTION_END ? kEndColour
                                                    : kLoopColour;
        colour(cr, c);
        const double x0 = l.left + s.first / frames * l.plot_w;
        const double x1 = l.left + (s.first + s.frames) / frames * l.plot_w;
        cairo_rectangle(cr, x0, l.strip_y, std::max(1.0, x1 - x0), l.strip_h);
        cairo_fill(cr);
    }
}

void draw_waveform(cairo_t* cr, const Layout& l, const std::vector<int16_t>& pcm, uint32_t channels,
                   size_t frames) {
    const double lane_h = l.wave_h / channels;
    const auto cols = static_cast<size_t>(l.plot_w);
    for (uint32_t c = 0; c < channels; ++c) {
        const double mid = l.wave_y + lane_h * (c + 0.5);
        colour(cr, kGrid);
        cairo_set_line_width(cr, 1.0);
        cairo_move_to(cr, l.left, mid + 0.5);
        cairo_line_to(cr, l.left + l.plot_w, mid + 0.5);
        cairo_stroke(cr);
        text(cr, l.left - 8, mid + 4, channels == 1 ? "mono" : (c == 0 ? "L" : "R"), 12, kText,
             1.0);
        colour(cr, kWave);
        for (size_t x = 0; x < cols && frames > 0; ++x) {
            const size_t a = x * frames / cols;
            const size_t b = std::max(a + 1, (x + 1) * frames / cols);
            int lo = 32767, hi = -32768;
            for (size_t i = a; i < b && i < frames; ++i) {
                const int v = pcm[i * channels + c];
                lo = std::min(lo, v);
                hi = std::max(hi, v);
            }
            const double scale = lane_h / 2.0 / 32768.0;
            const double px = l.left + x + 0.5;
            cairo_move_to(cr, px, mid - hi * scale - 0.5);
            cairo_line_to(cr, px, mid - lo * scale + 0.5);
        }
        cairo_stroke(cr);
    }
}

// A Hann-windowed real FFT of `nfft` points, with its buffers and plan.
class Spectrum {
   public:
    explicit Spectrum(int nfft)
        : nfft_(nfft),
          bins_(nfft / 2 + 1),
          window_(nfft),
          in_(static_cast<double*>(fftw_malloc(sizeof(double) * nfft))),
          out_(static_cast<fftw_complex*>(fftw_malloc(sizeof(fftw_complex) * bins_))) {
        if (!in_ || !out_) {
            fftw_free(in_);
            fftw_free(out_);
            failure("out of memory for the spectrogram");
        }
        for (int i = 0; i < nfft; ++i) {
            window_[i] = 0.5 - 0.5 * std::cos(2.0 * std::numbers::pi * i / nfft);
            wsum_ += window_[i];
        }
        plan_ = fftw_plan_dft_r2c_1d(nfft, in_, out_, FFTW_ESTIMATE);
    }
    ~Spectrum() {
        fftw_destroy_plan(plan_);
        fftw_free(in_);
        fftw_free(out_);
        fftw_cleanup();
    }
    Spectrum(const Spectrum&) = delete;
    Spectrum& operator=(const Spectrum&) = delete;

    int bins() const { return bins_; }

    // Level in dB of each bin for the window centred on frame `centre` (channels mixed; frames
    // outside the sound count as silence). A full-scale sine at a bin's centre reads 0 dB.
    void levels(const std::vector<int16_t>& pcm, uint32_t channels, size_t frames, long long centre,
                std::vector<double>& db) {
        const long long first = centre - nfft_ / 2;
        for (int i = 0; i < nfft_; ++i) {
            const long long f = first + i;
            double v = 0;
            if (f >= 0 && static_cast<size_t>(f) < frames) {
                for (uint32_t c = 0; c < channels; ++c)
                    v += pcm[static_cast<size_t>(f) * channels + c];
                v /= 32768.0 * channels;
            }
            in_[i] = v * window_[i];
        }
        fftw_execute(plan_);
        for (int b = 0; b < bins_; ++b) {
            const double mag = std::hypot(out_[b][0], out_[b][1]) / (wsum_ / 2.0);
            db[b] = 20.0 * std::log10(std::max(mag, 1e-12));
        }
    }

   private:
    int nfft_;
    int bins_;
    std::vector<double> window_;
    double wsum_ = 0;
    double* in_;
    fftw_complex* out_;
    fftw_plan plan_;
};

// Bin range of each pixel row (row 0 is the top, the highest frequencies).
std::vector<std::pair<int, int>> row_bin_ranges(int rows, int bins) {
    std::vector<std::pair<int, int>> row_bins(rows);
    for (int r = 0; r < rows; ++r) {
        const double f_hi = 1.0 - static_cast<double>(r) / rows;
        const double f_lo = 1.0 - static_cast<double>(r + 1) / rows;
        const int b0 = static_cast<int>(f_lo * (bins - 1));
        const int b1 = std::max(b0 + 1, static_cast<int>(f_hi * (bins - 1)));
        row_bins[r] = {b0, std::min(b1, bins)};
    }
    return row_bins;
}

void draw_frequency_axis(cairo_t* cr, const Layout& l, uint32_t rate) {
    const double nyquist_khz = rate / 2000.0;
    const double step = nice_step(nyquist_khz, 6);
    for (double f = 0; f <= nyquist_khz + 1e-9; f += step) {
        const double y = l.spectro_y + l.spectro_h * (1.0 - f / nyquist_khz);
        text(cr, l.left - 8, y + 4, tick_label(f, step), 11, kText, 1.0);
    }
    cairo_save(cr);
    cairo_translate(cr, 16, l.spectro_y + l.spectro_h / 2);
    cairo_rotate(cr, -std::numbers::pi / 2);
    text(cr, 0, 0, "kHz", 12, kText, 0.5);
    cairo_restore(cr);
}

/* Short-time spectrum of the channel mix, one Hann-windowed FFT per pixel column, linear
 * frequency axis from 0 Hz (bottom) to half the sample rate (top); each pixel row shows the
 * loudest bin of its range. */
void draw_spectrogram(cairo_t* cr, const Layout& l, const std::vector<int16_t>& pcm, uint32_t rate,
                      uint32_t channels, size_t frames) {
    const int cols = static_cast<int>(l.plot_w);
    const int rows = static_cast<int>(l.spectro_h);
    if (cols < 1 || rows < 1) return;
    Spectrum spectrum(rate >= 32000 ? 1024 : 512);
    const std::vector<std::pair<int, int>> row_bins = row_bin_ranges(rows, spectrum.bins());

    cairo_surface_t* img = cairo_image_surface_create(CAIRO_FORMAT_RGB24, cols, rows);
    cairo_surface_flush(img);
    unsigned char* data = cairo_image_surface_get_data(img);
    const int stride = cairo_image_surface_get_stride(img);
    std::vector<double> db(spectrum.bins());
    for (int x = 0; x < cols; ++x) {
        const auto centre = static_cast<long long>((x + 0.5) * static_cast<double>(frames) / cols);
        spectrum.levels(pcm, channels, frames, centre, db);
        for (int r = 0; r < rows; ++r) {
            double peak = kFloorDb;
            for (int b = row_bins[r].first; b < row_bins[r].second; ++b)
                peak = std::max(peak, db[b]);
            const Rgb c = heat((peak - kFloorDb) / -kFloorDb);
            auto* px = reinterpret_cast<uint32_t*>(data + r * stride) + x;
            *px = (static_cast<uint32_t>(c.r * 255) << 16) |
                  (static_cast<uint32_t>(c.g * 255) << 8) | static_cast<uint32_t>(c.b * 255);
        }
    }
    cairo_surface_mark_dirty(img);
    cairo_set_source_surface(cr, img, l.left, l.spectro_y);
    cairo_paint(cr);
    cairo_surface_destroy(img);
    draw_frequency_axis(cr, l, rate);
}

void draw_time_axis(cairo_t* cr, const Layout& l, double seconds) {
    const double span = std::max(seconds, 1e-3);
    const double step = nice_step(span, 12);
    const double bottom = l.spectro_y + l.spectro_h;
    cairo_set_line_width(cr, 1.0);
    for (double t = 0; t <= span + 1e-9; t += step) {
        const double x = std::round(l.left + t / span * l.plot_w) + 0.5;
        colour(cr, kGrid, 0.6);
        cairo_move_to(cr, x, l.wave_y);
        cairo_line_to(cr, x, l.wave_y + l.wave_h);
        cairo_move_to(cr, x, bottom);
        cairo_line_to(cr, x, bottom + 5);
        cairo_stroke(cr);
        text(cr, x, bottom + 18, tick_label(t, step), 11, kText, 0.5);
    }
    text(cr, l.left + l.plot_w, bottom + 32, "seconds", 11, kText, 1.0);
}

cairo_status_t write_to_fd(void* closure, const unsigned char* data, unsigned int length) {
    const int fd = *static_cast<int*>(closure);
    while (length > 0) {
        const ssize_t n = write(fd, data, length);
        if (n <= 0) return CAIRO_STATUS_WRITE_ERROR;
        data += n;
        length -= static_cast<unsigned int>(n);
    }
    return CAIRO_STATUS_SUCCESS;
}

void draw_and_write(OutputFile& file, const std::vector<int16_t>& pcm, uint32_t rate,
                    uint32_t channels, const std::vector<Segment>& segments,
                    const PictureOptions& opts) {
    const std::string& path = file.path();
    std::unique_ptr<cairo_surface_t, decltype(&cairo_surface_destroy)> surface(
        cairo_image_surface_create(CAIRO_FORMAT_RGB24, static_cast<int>(opts.width),
                                   static_cast<int>(opts.height)),
        cairo_surface_destroy);
    if (cairo_surface_status(surface.get()) != CAIRO_STATUS_SUCCESS) {
        failure("cannot draw " + in_quotes(path) + ": " +
                cairo_status_to_string(cairo_surface_status(surface.get())));
    }
    std::unique_ptr<cairo_t, decltype(&cairo_destroy)> cr_owner(cairo_create(surface.get()),
                                                                cairo_destroy);
    cairo_t* cr = cr_owner.get();
    cairo_select_font_face(cr, "sans-serif", CAIRO_FONT_SLANT_NORMAL, CAIRO_FONT_WEIGHT_NORMAL);

    const Layout l = layout(opts.width, opts.height);
    const size_t frames = pcm.size() / channels;
    const double seconds = static_cast<double>(frames) / rate;

    colour(cr, kBackground);
    cairo_paint(cr);
    colour(cr, kPanel);
    cairo_rectangle(cr, l.left, l.wave_y, l.plot_w, l.wave_h);
    cairo_fill(cr);

    char info[128];
    std::snprintf(info, sizeof info, "%u Hz, %u ch, %.2f s", rate, channels, seconds);
    text(cr, l.left, 24, opts.title.empty() ? std::string(info) : opts.title + "   " + info, 14,
         kText);
    double lx = l.left + l.plot_w;
    for (auto [name, c] : {std::pair{"end", kEndColour}, std::pair{"loop", kLoopColour},
                           std::pair{"start", kStartColour}}) {
        text(cr, lx, 24, name, 12, kText, 1.0);
        cairo_text_extents_t ext{};
        cairo_text_extents(cr, name, &ext);
        colour(cr, c);
        cairo_rectangle(cr, lx - ext.x_advance - 14, 15, 10, 10);
        cairo_fill(cr);
        lx -= ext.x_advance + 30;
    }

    if (frames > 0) {
        draw_segments(cr, l, segments, static_cast<double>(frames));
        draw_waveform(cr, l, pcm, channels, frames);
    } else {
        text(cr, l.left + l.plot_w / 2, l.wave_y + l.wave_h / 2, "no sound", 14, kText, 0.5);
    }
    draw_spectrogram(cr, l, pcm, rate, channels, frames);
    draw_time_axis(cr, l, seconds);

    cairo_surface_flush(surface.get());
    int fd = file.fd();
    const cairo_status_t st = cairo_surface_write_to_png_stream(surface.get(), write_to_fd, &fd);
    if (st != CAIRO_STATUS_SUCCESS)
        failure("cannot write " + in_quotes(path) + ": " + cairo_status_to_string(st));
}

}  // namespace

void write_picture(OutputFile& file, const std::vector<int16_t>& pcm, uint32_t rate,
                   uint32_t channels, const std::vector<Segment>& segments,
                   const PictureOptions& opts) {
    // The process draws one picture: afterwards (also after a failure) hand back the font caches
    // that cairo and fontconfig keep for the life of the process, so leak checkers see a clean
    // exit. Runs once the drawing's surfaces are gone.
    struct FontCaches {
        ~FontCaches() {
            cairo_debug_reset_static_data();
            FcFini();
        }
    } release;
    draw_and_write(file, pcm, rate, channels, segments, opts);
}

}  // namespace kova_tool
