// Which clients get a compressed answer, and that what they get unpacks to the answer.
#include "sim/Compression.h"

#include <zlib.h>

#include <gtest/gtest.h>

namespace kyn::sim {
namespace {

TEST(CompressionTest, GzipGoesOnlyToClientsThatTakeIt) {
  const struct {
    const char* header;
    bool gzip;
  } cases[] = {
      {"", false},           {"br", false},           {"deflate, gzip", true},     {"GZip;q=0.5", true},
      {"gzip;q=0", false},   {"gzip; q=0.000", false}, {"*", true},                {"br, *;q=0", false},
      {"x-gzip", true},      {"gzipped", false},
  };
  for (const auto& c : cases) EXPECT_EQ(acceptsGzip(c.header), c.gzip) << '"' << c.header << '"';
}

TEST(CompressionTest, AGzippedBodyUnpacksToTheBody) {
  std::string body;
  for (int i = 0; i < 200; ++i) body += R"({"handle": "friend)" + std::to_string(i) + R"(@example.com"}, )";
  const auto packed = gzip(body);
  ASSERT_TRUE(packed);
  EXPECT_LT(packed->size(), body.size());

  z_stream stream{};
  ASSERT_EQ(inflateInit2(&stream, 15 + 16), Z_OK);  // a gzip header, as a client expects
  std::string out(body.size() + 16, '\0');
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(packed->data()));
  stream.avail_in = static_cast<uInt>(packed->size());
  stream.next_out = reinterpret_cast<Bytef*>(out.data());
  stream.avail_out = static_cast<uInt>(out.size());
  EXPECT_EQ(inflate(&stream, Z_FINISH), Z_STREAM_END);
  out.resize(stream.total_out);
  inflateEnd(&stream);
  EXPECT_EQ(out, body);
}

}  // namespace
}  // namespace kyn::sim
