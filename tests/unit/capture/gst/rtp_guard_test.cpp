// Packets that depayloaders don't survive, given to real ones.
#include "capture/gst/rtp_guard.h"

#include <gst/rtp/gstrtpbuffer.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <vector>

#include "capture/gst/gst_handles.h"
#include "tests/unit/capture/gst/guarded_element.h"

namespace lmx {
namespace {

using Payload = std::vector<std::uint8_t>;

constexpr const char* kAac =
    "application/x-rtp,media=audio,clock-rate=48000,encoding-name=MPEG4-GENERIC,mode=AAC-hbr,"
    "streamtype=(string)5,config=(string)1190,sizelength=(string)13,indexlength=(string)3,"
    "indexdeltalength=(string)3,payload=97";
constexpr const char* kH264 = "application/x-rtp,media=video,clock-rate=90000,encoding-name=H264,payload=96";
constexpr const char* kH265 = "application/x-rtp,media=video,clock-rate=90000,encoding-name=H265,payload=96";
constexpr const char* kG711 = "application/x-rtp,media=audio,clock-rate=8000,encoding-name=PCMU,payload=0";

/// A depayloader behind its guard.
class Depayloader {
 public:
  Depayloader(const std::string& name, const std::string& caps, const char* wanted = "ANY")
      : element_(guardDepayloadersIn, name, caps, wanted) {}

  void push(const Payload& payload, bool last = true) { element_.push(packet(payload, last)); }
  /// All at once, as a list.
  void pushList(const std::vector<Payload>& payloads) {
    GstBufferList* list = gst_buffer_list_new();
    for (const Payload& payload : payloads) gst_buffer_list_add(list, packet(payload, true));
    element_.pushList(list);
  }
  /// Everything that has come out, once all packets are through.
  std::vector<Payload> result() {
    std::vector<Payload> all;
    for (const SampleHandle& sample : element_.result()) all.push_back(testing::bytesOf(sample));
    return all;
  }

 private:
  GstBuffer* packet(const Payload& payload, bool last) {
    GstBuffer* buffer = gst_rtp_buffer_new_allocate(static_cast<guint>(payload.size()), 0, 0);
    GstRTPBuffer packet = GST_RTP_BUFFER_INIT;
    gst_rtp_buffer_map(buffer, GST_MAP_READWRITE, &packet);
    gst_rtp_buffer_set_seq(&packet, number_);
    gst_rtp_buffer_set_timestamp(&packet, 1024U * number_);
    gst_rtp_buffer_set_marker(&packet, static_cast<gboolean>(last));
    const guint header = gst_rtp_buffer_get_header_len(&packet);
    gst_rtp_buffer_unmap(&packet);
    gst_buffer_fill(buffer, header, payload.data(), payload.size());
    GST_BUFFER_PTS(buffer) = number_++ * 20 * GST_MSECOND;
    return buffer;
  }

  testing::GuardedElement element_;
  std::uint16_t number_ = 1;
};

TEST(RtpGuard, DropsAnAccessUnitOfNoBytes) {
  Depayloader aac("rtpmp4gdepay", kAac);
  aac.push({0, 16, 0, 16, 1, 2});
  aac.push({0, 16, 0, 0, 3, 4});
  aac.push({0, 16, 0, 16, 5, 6});
  EXPECT_EQ(aac.result(), (std::vector<Payload>{{1, 2}, {5, 6}}));
}

TEST(RtpGuard, DropsWhatIsInAList) {
  Depayloader aac("rtpmp4gdepay", kAac);
  aac.pushList({{0, 16, 0, 16, 1, 2}, {0, 16, 0, 0, 3, 4}, {0, 16, 0, 16, 5, 6}, {0, 16, 0, 0}});
  EXPECT_EQ(aac.result(), (std::vector<Payload>{{1, 2}, {5, 6}}));
}

TEST(RtpGuard, DropsAFragmentWithoutItsHeader) {
  Depayloader h264("rtph264depay", kH264, "video/x-h264,stream-format=byte-stream");
  h264.push({0x7C, 0x85, 1, 2}, false);
  h264.push({0x7C});
  h264.push({0x65, 0x88, 1, 2});
  const Payload whole = {0, 0, 0, 1, 0x65, 0x88, 1, 2};
  const auto result = h264.result();
  ASSERT_FALSE(result.empty());
  EXPECT_TRUE(std::equal(whole.rbegin(), whole.rend(), result.back().rbegin()));

  Depayloader h265("rtph265depay", kH265, "video/x-h265,stream-format=byte-stream");
  h265.push({0x62, 1, 0x93, 1, 2}, false);
  h265.push({0x62, 1});
  h265.push({0x26, 1, 0xAF, 1, 2});
  EXPECT_FALSE(h265.result().empty());
}

TEST(RtpGuard, DropsAnEmptyPacketAmidAFragmentedPicture) {
  Depayloader h264("rtph264depay", kH264, "video/x-h264,stream-format=byte-stream");
  h264.push({0x7C, 0x85, 1, 2}, false);
  h264.push({}, false);
  h264.push({0x7C, 0x05, 3, 4}, false);
  h264.push({0x65, 0x88, 1, 2});
  EXPECT_FALSE(h264.result().empty());

  Depayloader h265("rtph265depay", kH265, "video/x-h265,stream-format=byte-stream");
  h265.push({0x62, 1, 0x93, 1, 2}, false);
  h265.push({}, false);
  h265.push({0x62, 1, 0x13, 3, 4}, false);
  h265.push({0x26, 1, 0xAF, 1, 2});
  EXPECT_FALSE(h265.result().empty());
}

struct Stream {
  const char* name;
  const char* depayloader;
  std::string caps;
  const char* wanted;
  Payload sound;  ///< the payload of a packet that gives a picture or sound once another of the kind follows
};

void PrintTo(const Stream& stream, std::ostream* out) { *out << stream.name; }

class DamagedStream : public ::testing::TestWithParam<Stream> {};

/// A payload cut or prolonged, with some bytes changed; more often those of its headers.
Payload damaged(Payload payload, std::minstd_rand& chance) {
  const auto below = [&](std::size_t limit) {
    return std::uniform_int_distribution<std::size_t>(0, limit - 1)(chance);
  };
  if (below(3) == 0) payload.resize(below(48));
  for (auto changes = below(4); changes > 0 && !payload.empty(); --changes) {
    const auto place = below(below(2) == 0 ? payload.size() : std::min<std::size_t>(payload.size(), 6));
    payload[place] = static_cast<std::uint8_t>(below(2) == 0 ? below(2) * 16 : below(256));
  }
  return payload;
}

TEST_P(DamagedStream, DoesNoHarm) {
  const Stream& stream = GetParam();
  Depayloader depayloader(stream.depayloader, stream.caps, stream.wanted);
  std::minstd_rand chance(1);
  for (int i = 0; i < 20000; ++i) depayloader.push(damaged(stream.sound, chance), chance() % 2 == 0);
  for (int i = 0; i < 2; ++i) depayloader.push(stream.sound);
  const auto result = depayloader.result();
  ASSERT_FALSE(result.empty());
  const Payload last(stream.sound.end() - 2, stream.sound.end());
  EXPECT_NE(std::search(result.back().begin(), result.back().end(), last.begin(), last.end()),
            result.back().end());
}

const std::string kOtherAac =
    "application/"
    "x-rtp,media=audio,clock-rate=48000,encoding-name=MPEG4-GENERIC,mode=generic,config=(string)1190,"
    "payload=97,sizelength=(string)";

INSTANTIATE_TEST_SUITE_P(
    RtpGuard, DamagedStream,
    ::testing::Values(
        Stream{"AAC", "rtpmp4gdepay", kAac, "ANY", {0, 32, 0, 16, 0, 24, 1, 2, 3, 4, 5}},
        Stream{"AAC with long headers",
               "rtpmp4gdepay",
               kOtherAac + "13,indexlength=(string)3,indexdeltalength=(string)3,ctsdeltalength=(string)8",
               "ANY",
               {0, 17, 0, 16, 0, 4, 5}},
        Stream{"AAC with further data",
               "rtpmp4gdepay",
               kOtherAac +
                   "13,indexlength=(string)3,indexdeltalength=(string)3,auxiliarydatasizelength=(string)8",
               "ANY",
               {0, 16, 0, 24, 8, 1, 4, 5}},
        Stream{"AAC without headers", "rtpmp4gdepay", kOtherAac + "0", "ANY", {4, 5}},
        Stream{"H.264",
               "rtph264depay",
               kH264,
               "video/x-h264,stream-format=byte-stream",
               {0x7C, 0x85, 0x88, 1, 2, 3, 4, 5}},
        Stream{"H.265",
               "rtph265depay",
               kH265,
               "video/x-h265,stream-format=byte-stream",
               {0x62, 1, 0x93, 0xAF, 1, 2, 3, 4, 5}},
        Stream{"JPEG",
               "rtpjpegdepay",
               "application/x-rtp,media=video,clock-rate=90000,encoding-name=JPEG,payload=26",
               "ANY",
               {0, 0, 0, 0, 1, 50, 40, 22, 1, 2, 3, 4, 5}}));

TEST(RtpGuard, LetsOthersTakeWhatIsNotEmpty) {
  Depayloader g711("rtppcmudepay", kG711);
  g711.push({1, 2, 3});
  g711.push({});
  g711.push({4});
  EXPECT_EQ(g711.result(), (std::vector<Payload>{{1, 2, 3}, {4}}));
}

}  // namespace
}  // namespace lmx
