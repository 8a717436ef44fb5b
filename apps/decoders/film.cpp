// A frame of the film that is standard input, to standard output: JPEG, its longest edge at most as many pixels as the
// argument says, with the orientation as EXIF. It opens nothing: what a film names elsewhere stays there.
#include <unistd.h>

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavformat/avformat.h>
#include <libavutil/display.h>
#include <libavutil/imgutils.h>
#include <libswscale/swscale.h>
}

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>

namespace {

// Containers and codecs of films that people have; the rest of the library stays shut.
constexpr const char* kFormats = "mov,matroska,avi,asf,flv,mpegts,mpeg,ogg";
constexpr const char* kCodecs =
    "h264,hevc,vp8,vp9,libdav1d,mpeg4,msmpeg4v2,msmpeg4,mpeg1video,mpeg2video,h263,flv,wmv1,wmv2,wmv3,vc1,theora,mjpeg,"
    "prores,dvvideo,vp6,vp6f,vp6a,dnxhd,svq1,svq3,rawvideo";
constexpr std::int64_t kMostRead = std::int64_t{512} << 20;
constexpr std::int64_t kMostPixels = std::int64_t{1} << 26;
constexpr int kMostPackets = 1000;                     // for a frame
constexpr double kPlaces[] = {0.1, 0.3, 0.5, 0.7, 0};  // of the duration
constexpr double kContrast = 12;                       // of 255: less is black, or a fade
constexpr int kBuffer = 1 << 16;

struct Free {
    void operator()(AVFormatContext* format) const { avformat_close_input(&format); }
    void operator()(AVCodecContext* codec) const { avcodec_free_context(&codec); }
    void operator()(AVFrame* frame) const { av_frame_free(&frame); }
    void operator()(AVPacket* packet) const { av_packet_free(&packet); }
    void operator()(SwsContext* scaler) const { sws_freeContext(scaler); }
};
template <class T>
using Owned = std::unique_ptr<T, Free>;

int readFilm(void* all, std::uint8_t* buffer, int size) {
    auto& read = *static_cast<std::int64_t*>(all);
    const ssize_t got = read < kMostRead ? ::read(STDIN_FILENO, buffer, static_cast<size_t>(size)) : 0;
    read += std::max<ssize_t>(got, 0);
    return got > 0 ? static_cast<int>(got) : AVERROR_EOF;
}

std::int64_t seekFilm(void* /*all*/, std::int64_t to, int from) {
    if ((from & AVSEEK_SIZE) == 0) return lseek(STDIN_FILENO, to, from & ~AVSEEK_FORCE);
    const off_t here = lseek(STDIN_FILENO, 0, SEEK_CUR);
    const off_t size = lseek(STDIN_FILENO, 0, SEEK_END);
    return lseek(STDIN_FILENO, here, SEEK_SET) < 0 ? -1 : size;
}

int openNothing(AVFormatContext*, AVIOContext**, const char*, int, AVDictionary**) {
    return AVERROR(EACCES);
}

class Film {
 public:
    bool open() {
        AVFormatContext* format = avformat_alloc_context();
        AVDictionary* options = nullptr;
        if (format == nullptr || av_dict_set(&options, "codec_whitelist", kCodecs, 0) < 0 ||
            av_dict_set(&options, "format_whitelist", kFormats, 0) < 0 ||
            av_dict_set(&options, "protocol_whitelist", "none", 0) < 0) {
            return false;
        }
        format->pb = avio_alloc_context(static_cast<unsigned char*>(av_malloc(kBuffer)), kBuffer, 0, &read_, readFilm,
                                        nullptr, seekFilm);
        format->io_open = openNothing;
        const bool opened = avformat_open_input(&format, "", nullptr, &options) == 0;  // frees it where it fails
        av_dict_free(&options);
        if (!opened) return false;
        format_.reset(format);
        return avformat_find_stream_info(format, nullptr) >= 0 && openCodec();
    }

    // The first frame of use at or before that part of the film.
    Owned<AVFrame> frameAt(double part) {
        const std::int64_t start = format_->start_time == AV_NOPTS_VALUE ? 0 : format_->start_time;
        const std::int64_t duration = std::max<std::int64_t>(format_->duration, 0);  // 0: not known
        const auto at = start + static_cast<std::int64_t>(part * static_cast<double>(duration));
        if (av_seek_frame(format_.get(), -1, at, AVSEEK_FLAG_BACKWARD) < 0) return nullptr;
        avcodec_flush_buffers(codec_.get());
        const Owned<AVPacket> packet(av_packet_alloc());
        for (int count = 0; count < kMostPackets && av_read_frame(format_.get(), packet.get()) >= 0;) {
            const bool isOurs = packet->stream_index == stream_->index;
            const bool isKey = (packet->flags & AV_PKT_FLAG_KEY) != 0;
            const bool isSent = isOurs && avcodec_send_packet(codec_.get(), packet.get()) == 0;
            av_packet_unref(packet.get());
            if (!isOurs) continue;
            ++count;
            // A frame that stands alone is given at once if nothing is to follow.
            if (isSent && isKey) avcodec_send_packet(codec_.get(), nullptr);
            if (Owned<AVFrame> frame = receive()) return frame;
        }
        avcodec_send_packet(codec_.get(), nullptr);
        return receive();
    }

    // 1 to 8, as EXIF has it.
    [[nodiscard]] char orientation() const {
        const std::uint8_t* matrix = av_stream_get_side_data(stream_, AV_PKT_DATA_DISPLAYMATRIX, nullptr);
        if (matrix == nullptr) return 1;
        const double turn = av_display_rotation_get(reinterpret_cast<const std::int32_t*>(matrix));
        if (std::isnan(turn)) return 1;
        constexpr char kTurned[] = {1, 8, 3, 6};  // by quarters against the clock
        return kTurned[(std::lround(turn / 90) % 4 + 4) % 4];
    }

    // Width by height of one of its pixels.
    double pixelShape(AVFrame* frame) {
        const AVRational shape = av_guess_sample_aspect_ratio(format_.get(), stream_, frame);
        const double ratio = shape.num > 0 && shape.den > 0 ? av_q2d(shape) : 1;
        return ratio > 0.1 && ratio < 10 ? ratio : 1;
    }

 private:
    bool openCodec() {
        const AVCodec* decoder = nullptr;
        const int number = av_find_best_stream(format_.get(), AVMEDIA_TYPE_VIDEO, -1, -1, &decoder, 0);
        if (number < 0 || decoder == nullptr) return false;
        stream_ = format_->streams[number];
        if ((stream_->disposition & AV_DISPOSITION_ATTACHED_PIC) != 0) return false;  // music with a cover
        for (unsigned other = 0; other < format_->nb_streams; ++other) {
            if (format_->streams[other] != stream_) format_->streams[other]->discard = AVDISCARD_ALL;
        }
        codec_.reset(avcodec_alloc_context3(decoder));
        if (codec_ == nullptr || avcodec_parameters_to_context(codec_.get(), stream_->codecpar) < 0) return false;
        codec_->thread_count = 1;
        codec_->max_pixels = kMostPixels;
        AVDictionary* options = nullptr;
        av_dict_set(&options, "codec_whitelist", kCodecs, 0);
        const bool isOpen = avcodec_open2(codec_.get(), decoder, &options) == 0;
        av_dict_free(&options);
        return isOpen;
    }

    Owned<AVFrame> receive() {
        Owned<AVFrame> frame(av_frame_alloc());
        const int result = frame == nullptr ? AVERROR(ENOMEM) : avcodec_receive_frame(codec_.get(), frame.get());
        if (result == AVERROR_EOF) avcodec_flush_buffers(codec_.get());
        return result == 0 && frame->width > 0 && frame->height > 0 ? std::move(frame) : nullptr;
    }

    std::int64_t read_ = 0;
    Owned<AVFormatContext> format_;
    Owned<AVCodecContext> codec_;
    AVStream* stream_ = nullptr;
};

Owned<AVFrame> shrunk(const AVFrame& frame, double pixelShape, int edge) {
    const double width = frame.width * pixelShape;
    const double scale = std::min(1.0, edge / std::max<double>(width, frame.height));
    Owned<AVFrame> small(av_frame_alloc());
    if (small == nullptr) return nullptr;
    small->format = AV_PIX_FMT_YUVJ420P;
    small->width = std::max(1, static_cast<int>(std::lround(width * scale)));
    small->height = std::max(1, static_cast<int>(std::lround(frame.height * scale)));
    const Owned<SwsContext> scaler(sws_getContext(frame.width, frame.height, static_cast<AVPixelFormat>(frame.format),
                                                  small->width, small->height, AV_PIX_FMT_YUVJ420P, SWS_AREA, nullptr,
                                                  nullptr, nullptr));
    if (scaler == nullptr || av_frame_get_buffer(small.get(), 0) < 0 ||
        sws_scale(scaler.get(), frame.data, frame.linesize, 0, frame.height, small->data, small->linesize) <= 0) {
        return nullptr;
    }
    return small;
}

// How far its brightness strays from the mean.
double contrastOf(const AVFrame& frame) {
    double sum = 0, squares = 0;
    for (int y = 0; y < frame.height; ++y) {
        const std::uint8_t* line = frame.data[0] + y * frame.linesize[0];
        for (int x = 0; x < frame.width; ++x) {
            sum += line[x];
            squares += line[x] * line[x];
        }
    }
    const double count = static_cast<double>(frame.width) * frame.height;
    return std::sqrt(std::max(0.0, squares / count - sum / count * (sum / count)));
}

bool writeJpeg(const AVFrame& frame, char orientation) {
    const AVCodec* encoder = avcodec_find_encoder(AV_CODEC_ID_MJPEG);
    const Owned<AVCodecContext> codec(avcodec_alloc_context3(encoder));
    const Owned<AVPacket> packet(av_packet_alloc());
    if (encoder == nullptr || codec == nullptr || packet == nullptr) return false;
    codec->width = frame.width;
    codec->height = frame.height;
    codec->pix_fmt = AV_PIX_FMT_YUVJ420P;
    codec->time_base = {1, 25};
    codec->flags |= AV_CODEC_FLAG_QSCALE;
    codec->global_quality = 2 * FF_QP2LAMBDA;
    if (avcodec_open2(codec.get(), encoder, nullptr) < 0 || avcodec_send_frame(codec.get(), &frame) < 0 ||
        avcodec_receive_packet(codec.get(), packet.get()) < 0 || packet->size < 2) {
        return false;
    }
    std::string jpeg(
        "\xFF\xD8\xFF\xE1\0\x22"
        "Exif\0\0MM\0*\0\0\0\x08\0\x01\x01\x12\0\x03\0\0\0\x01\0?\0\0\0\0\0\0",
        38);
    jpeg[31] = orientation;
    jpeg.append(reinterpret_cast<const char*>(packet->data) + 2, static_cast<size_t>(packet->size) - 2);
    return write(STDOUT_FILENO, jpeg.data(), jpeg.size()) == static_cast<ssize_t>(jpeg.size());
}

}  // namespace

int main(int count, char** words) {
    av_log_set_level(AV_LOG_QUIET);
    const int edge = count == 2 ? static_cast<int>(strtol(words[1], nullptr, 10)) : 0;
    Film film;
    if (edge < 1 || edge > 4096 || !film.open()) return 1;
    Owned<AVFrame> best;
    double contrast = -1;
    for (const double part : kPlaces) {
        const Owned<AVFrame> frame = film.frameAt(part);
        Owned<AVFrame> small = frame == nullptr ? nullptr : shrunk(*frame, film.pixelShape(frame.get()), edge);
        if (small == nullptr || contrastOf(*small) <= contrast) continue;
        contrast = contrastOf(*small);
        best = std::move(small);
        if (contrast >= kContrast) break;
    }
    return best != nullptr && writeJpeg(*best, film.orientation()) ? 0 : 1;
}
