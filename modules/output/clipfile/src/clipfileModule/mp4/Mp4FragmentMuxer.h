#pragma once

#include <list>
#include <optional>

#include "mp4/Mp4File.h"

namespace clipfileModule {

// Contract: timecode-place-empty. Told in the last paragraph.
/// Writes a fragmented file (ISO/IEC 14496-12 8.8): `ftyp`, `uuid`, `moov`, `mdat`, then pairs of `moof` and
/// `mdat`, and `mfra`. The index of each 32 chunks is on disk before their bytes, so the file is readable up
/// to its last complete fragment at any time after the first.
///
/// Chunks wait in memory until their fragment is written. A flush that fails keeps them, and the next one
/// tries again from there.
///
/// With the kept rules `WriteTmcd` enters its sample in the waiting fragment and writes its bytes at the end
/// of the one before, where the index of the waiting one then overwrites them: the sample's place in the file
/// is left zero. The edits end with what `moov` describes. A flush that is tried again seals and shifts
/// again.
///
/// With exact rules the timecode's bytes wait with the chunks, there are no edits, a track whose samples
/// begin behind `moov` states its defaults in each fragment, and a flush that failed is carried on where it
/// stood.
class Mp4FragmentMuxer : public Mp4File {
 public:
    ~Mp4FragmentMuxer() override;

    bool Open(const OutputSettings& stream, const unsigned char* timecode, bool dropFrame) override;
    bool Write(const std::shared_ptr<ChunkData>& chunk) override;
    std::uint64_t GetWrittenSize() override;
    /// An estimate once the first fragment is written, 2^64 - 1 when it cannot be told before.
    std::uint64_t GetBoxSize() override;
    /// Fails too when the `moov` that is written again would not fill the place of the first one exactly;
    /// that one then stays as it is.
    bool Close() override;

 protected:
    void FillSessionConfig(MbxSessionConfig& config) override;
    MbxStatus createFprf() override;
    std::uint32_t IsFragmentOpen() override;
    /// With exact rules the tracks have none, but for video in decoding order, which begins with one. The
    /// length of a fragmented file is not known before its end, and readers differ in what an edit shorter
    /// than the file, or of duration 0, hides.
    bool hasEdit(TrackSlot track) const override {
        return !isExact() || (track == kVideoTrack && inDecodingOrder());
    }
    MbxStatus storeTimecode(const std::array<std::uint8_t, kTimecodeSize>& bytes) override;
    void Reset() override;

 private:
    /// Writes the waiting chunks: as the part that `moov` describes the first time, as a fragment then.
    MbxStatus closeMovie();
    MbxStatus closeMoov();
    MbxStatus closeMoof();
    /// Makes what waits a flush of its own. The tables are sealed.
    void beginFlush();
    /// Leaves a flush that failed, which began at `position`, to the next one. Passes its status on.
    MbxStatus endFlush(MbxStatus status, std::uint64_t position);
    /// With exact rules, sets how long the edit of the video lasts, if it has one.
    MbxStatus setExactEdit(std::uint64_t duration);
    /// Makes each track without a sample in `moov` state its defaults in its fragments: until `moov` is
    /// written again at the end, its `trex` tells nothing that they could rest on.
    MbxStatus forceLateDefaults();
    // Steps of `closeMoov` and `closeMoof`.
    MbxStatus writeMoovAndMdat(MuxerRoutine& routine);
    MbxStatus writeMoofAndMdat(MuxerRoutine& routine);
    /// Size of a `mdat` header of the session.
    MbxStatus measureMdatHeader(std::uint64_t& size);
    /// Writes `mdat` at the position, and counts its bytes as complete.
    MbxStatus writeMdat(MuxerRoutine& routine);
    /// Writes the last fragment, `moov` again and the fragment index. Steps of `Close`.
    MbxStatus completeFragments(MuxerRoutine& routine);

    /// The next flush writes `moov`.
    bool m_first = true;
    std::uint32_t m_chunk_count = 0;
    /// Number of the next `moof`.
    std::uint32_t m_sequence = 1;
    std::uint64_t m_moov_position = 0;
    /// Bytes by which the index has grown, by estimate.
    std::uint64_t m_estimate = 0;
    /// Chunks whose bytes are not written yet and whose tables take more.
    std::list<std::shared_ptr<ChunkData>> m_pending;
    /// What is being written, from the seal of its tables on.
    struct Flush {
        std::list<std::shared_ptr<ChunkData>> chunks;
        std::uint64_t payload;  // bytes of their samples
        std::uint64_t shift;    // what was added to their chunk offsets
        bool hasEdits;          // the tracks have got theirs, which only `moov` tells
    };
    std::optional<Flush> m_flush;
    const std::uint32_t m_chunks_per_fragment = 32;
    // Contract: index-is-estimated. Not measured, once there is a fragment.
    const std::uint64_t m_tail_estimate = 600;  // bytes that closing adds
    const std::uint64_t m_chunk_estimate = 57;  // bytes of index that a chunk adds
    /// Bytes of the first `moov`.
    std::uint64_t m_moov_size = 0;
};

}  // namespace clipfileModule
