#include "fuzz/RecordingStream.h"

#include <zstd.h>

#include <memory>

#include "fuzz/Require.h"
#include "record/stream/Event.h"

namespace fuzz {

std::string recordingOf(std::string_view stream) {
  std::string recording(record::recordingMagic);
  recording.push_back(static_cast<char>(record::recordingVersion));
  const std::size_t head = recording.size();
  recording.resize(head + ZSTD_compressBound(stream.size()));
  recording.resize(head + ZSTD_compress(&recording[head], recording.size() - head, stream.data(), stream.size(), 1));
  return recording;
}

std::string streamOf(std::string_view recording) {
  recording.remove_prefix(record::recordingMagic.size() + 1);
  const std::unique_ptr<ZSTD_DCtx, decltype(&ZSTD_freeDCtx)> context(ZSTD_createDCtx(), &ZSTD_freeDCtx);
  std::string stream, room(ZSTD_DStreamOutSize(), '\0');
  ZSTD_inBuffer in{recording.data(), recording.size(), 0};
  while (in.pos < in.size) {
    ZSTD_outBuffer out{room.data(), room.size(), 0};
    require(!ZSTD_isError(ZSTD_decompressStream(context.get(), &out, &in)), "a recording that can be read");
    stream.append(room, 0, out.pos);
  }
  return stream;
}

}  // namespace fuzz
