#include "damaged/Damage.h"

#include <algorithm>
#include <array>
#include <map>
#include <utility>

namespace endtoend {
namespace {

/// Of the packets that a damage is for, one in so many has it.
constexpr unsigned int kRarity = 100;
constexpr unsigned char kAllBits = 0xFF;

/// Below `limit`. The distributions of the library are not the same everywhere.
std::size_t below(Random& random, std::size_t limit) {
    return random() % limit;
}

bool isOf(const Pids& pids, const Bytes& packet) {
    return packet.size() == kPacketSize && (pids.empty() || pids.count(PidOf(packet)) > 0);
}

std::size_t placeOf(const Pieces& pieces, double share) {
    return static_cast<std::size_t>(share * static_cast<double>(pieces.size()));
}

/// `hit` may change, remove or double a packet: it gives what stands in its place.
template <typename Hit>
Damage rarely(const Pids& pids, Hit hit) {
    return [pids, hit](const Pieces& pieces, Random& random) {
        Pieces damaged;
        for (const Bytes& packet : pieces) {
            if (isOf(pids, packet) && below(random, kRarity) == 0) {
                Pieces instead = hit(packet, random);
                std::move(instead.begin(), instead.end(), std::back_inserter(damaged));
            } else {
                damaged.push_back(packet);
            }
        }
        return damaged;
    };
}

/// Counts the packets of a PID anew, so that nothing seems to be missing.
Damage Renumber(int pid) {
    return [pid](Pieces pieces, Random& /*random*/) {
        int counter = 0;
        for (Bytes& packet : pieces) {
            if (isOf({pid}, packet) && PayloadOf(packet) < packet.size()) {
                SetContinuity(packet, counter++);
            }
        }
        return pieces;
    };
}

/// `change` is applied to each packet between two places.
template <typename Change>
Damage between(const Pids& pids, double from, double to, Change change) {
    return [pids, from, to, change](Pieces pieces, Random& /*random*/) {
        const std::size_t end = placeOf(pieces, to);
        for (std::size_t at = placeOf(pieces, from); at < end; ++at) {
            if (isOf(pids, pieces[at])) {
                change(pieces[at]);
            }
        }
        return pieces;
    };
}

Bytes noise(Random& random, std::size_t size) {
    Bytes bytes(size);
    for (unsigned char& byte : bytes) {
        byte = static_cast<unsigned char>(below(random, 0x47));
    }
    return bytes;
}

Damage insertAt(double place, std::size_t size) {
    return [place, size](Pieces pieces, Random& random) {
        const auto at = pieces.begin() + static_cast<std::ptrdiff_t>(placeOf(pieces, place));
        pieces.insert(at, noise(random, size));
        return pieces;
    };
}

/// A PES packet of nothing but its header, with stuffing in front (2.4.3.4).
Bytes emptyUnit(int pid) {
    Bytes packet(kPacketSize, kAllBits);
    const unsigned char stream = pid == kVideoPid ? 0xE0 : 0xC0;
    const Bytes pes{0x00, 0x00, 0x01, stream, 0x00, 0x03, 0x80, 0x00, 0x00};
    const Bytes header{0x47,
                       static_cast<unsigned char>(0x40 | pid >> 8),
                       static_cast<unsigned char>(pid & 0xFF),
                       0x30,
                       static_cast<unsigned char>(kPacketSize - 5 - pes.size()),
                       0x00};
    std::copy(header.begin(), header.end(), packet.begin());
    std::copy(pes.begin(), pes.end(), packet.end() - static_cast<std::ptrdiff_t>(pes.size()));
    return packet;
}

}  // namespace

Damage Drop(const Pids& pids) {
    return rarely(pids, [](const Bytes&, Random&) { return Pieces{}; });
}

Damage Flip(const Pids& pids) {
    return rarely(pids, [](Bytes packet, Random& random) {
        packet[4 + below(random, kPacketSize - 4)] ^= kAllBits;
        return Pieces{std::move(packet)};
    });
}

Damage FlipHeaders(const Pids& pids) {
    return rarely(pids, [](Bytes packet, Random& random) {
        packet[below(random, 4)] ^= kAllBits;
        return Pieces{std::move(packet)};
    });
}

Damage Double(const Pids& pids) {
    return rarely(pids, [](const Bytes& packet, Random&) { return Pieces{packet, packet}; });
}

Damage Reorder(const Pids& pids) {
    return [pids](Pieces pieces, Random& random) {
        constexpr std::size_t kFurthest = 10;
        for (std::size_t at = 0; at + kFurthest < pieces.size(); ++at) {
            if (isOf(pids, pieces[at]) && below(random, kRarity) == 0) {
                const auto packet = pieces.begin() + static_cast<std::ptrdiff_t>(at);
                const auto later = static_cast<std::ptrdiff_t>(1 + below(random, kFurthest));
                std::rotate(packet, packet + 1, packet + later + 1);
            }
        }
        return pieces;
    };
}

Damage MiscountPackets(const Pids& pids) {
    return rarely(pids, [](Bytes packet, Random& random) {
        SetContinuity(packet, static_cast<int>(below(random, 16)));
        return Pieces{std::move(packet)};
    });
}

Damage MarkAsErroneous(const Pids& pids) {
    return rarely(pids, [](Bytes packet, Random&) {
        packet[1] |= 0x80;
        return Pieces{std::move(packet)};
    });
}

Damage Remove(const Pids& pids, double from, double to) {
    return [pids, from, to](const Pieces& pieces, Random& /*random*/) {
        const std::size_t begin = placeOf(pieces, from);
        const std::size_t end = placeOf(pieces, to);
        Pieces left;
        for (std::size_t at = 0; at < pieces.size(); ++at) {
            if (at < begin || at >= end || !isOf(pids, pieces[at])) {
                left.push_back(pieces[at]);
            }
        }
        return left;
    };
}

Damage Scramble(const Pids& pids, double from, double to) {
    return between(pids, from, to, [](Bytes& packet) {
        packet[3] = static_cast<unsigned char>(packet[3] | 0x80);
        for (std::size_t at = PayloadOf(packet); at < packet.size(); ++at) {
            packet[at] = static_cast<unsigned char>(packet[at] ^ (0xA5 + at));
        }
    });
}

Damage Repeat(double from, double to) {
    return [from, to](Pieces pieces, Random& /*random*/) {
        const Pieces again(pieces.begin() + static_cast<std::ptrdiff_t>(placeOf(pieces, from)),
                           pieces.begin() + static_cast<std::ptrdiff_t>(placeOf(pieces, to)));
        pieces.insert(pieces.begin() + static_cast<std::ptrdiff_t>(placeOf(pieces, to)), again.begin(),
                      again.end());
        return pieces;
    };
}

Damage Rename(int from, int to, double begin) {
    return between({}, begin, 1, [from, to](Bytes& packet) { RenamePid(packet, from, to); });
}

Damage NoiseInFront(std::size_t bytes) {
    return insertAt(0, bytes);
}

Damage NoiseAt(double place, std::size_t bytes) {
    return insertAt(place, bytes);
}

Damage CutAt(double place, std::size_t bytes) {
    return [place, bytes](Pieces pieces, Random& /*random*/) {
        Bytes& packet = pieces[placeOf(pieces, place)];
        packet.resize(packet.size() - bytes);
        return pieces;
    };
}

Damage EndAt(double place) {
    return [place](Pieces pieces, Random& /*random*/) {
        pieces.resize(placeOf(pieces, place));
        pieces.back().resize(kPacketSize / 2);
        return pieces;
    };
}

Damage Nothing() {
    return [](const Pieces&, Random&) { return Pieces{}; };
}

Damage OnlyNoise(std::size_t bytes) {
    return [bytes](const Pieces&, Random& random) { return Pieces{noise(random, bytes)}; };
}

Damage JumpBy(std::int64_t ticks, double place, const Pids& pids) {
    return between(pids, place, 1, [ticks](Bytes& packet) {
        ChangeStamps(packet, [ticks](std::int64_t stamp) { return stamp + ticks; });
    });
}

Damage WrapAt(double place) {
    return [place](Pieces pieces, Random& /*random*/) {
        std::size_t at = placeOf(pieces, place);
        while (!StampOf(pieces[at])) {
            ++at;
        }
        const std::int64_t offset = kStampSpan - *StampOf(pieces[at]);
        for (Bytes& packet : pieces) {
            ChangeStamps(packet, [offset](std::int64_t stamp) { return stamp + offset; });
        }
        return pieces;
    };
}

Damage StandStillAt(double place, const Pids& pids) {
    return [place, pids](Pieces pieces, Random& /*random*/) {
        std::map<int, std::int64_t> last;
        for (std::size_t at = placeOf(pieces, place); at < pieces.size(); ++at) {
            const auto stamp = StampOf(pieces[at]);
            if (isOf(pids, pieces[at]) && stamp) {
                const std::int64_t frozen = last.try_emplace(PidOf(pieces[at]), *stamp).first->second;
                ChangeStamps(pieces[at], [frozen](std::int64_t) { return frozen; });
            }
        }
        return pieces;
    };
}

Damage WithoutStamps(const Pids& pids) {
    return between(pids, 0, 1, RemoveStamps);
}

Damage WithoutClock() {
    return between({}, 0, 1, RemoveClock);
}

Damage EmptyUnits(int pid) {
    return [pid](const Pieces& pieces, Random& random) {
        constexpr std::size_t kUnits = 10;
        Pieces damaged;
        for (const Bytes& packet : pieces) {
            if (isOf({pid}, packet) && BeginsUnit(packet) && below(random, kUnits) == 0) {
                damaged.push_back(emptyUnit(pid));
            }
            damaged.push_back(packet);
        }
        return Renumber(pid)(std::move(damaged), random);
    };
}

Damage BreakParameterSets(double place, double end) {
    return between({kVideoPid}, place, end, [](Bytes& packet) {
        constexpr std::array<unsigned char, 3> kStartCode{0x00, 0x00, 0x01};
        constexpr std::ptrdiff_t kLength = 8;
        const auto found = std::search(packet.begin(), packet.end(), kStartCode.begin(), kStartCode.end());
        for (auto at = found; packet.end() - at > 4 + kLength;
             at = std::search(at + 1, packet.end(), kStartCode.begin(), kStartCode.end())) {
            if ((at[3] & 0x1F) == 7) {
                std::transform(at + 4, at + 4 + kLength, at + 4, [](unsigned char byte) {
                    // No start code may come of it.
                    return static_cast<unsigned char>(byte | 0x55);
                });
            }
        }
    });
}

Pieces Interleave(const Pieces& one, const Pieces& other) {
    Pieces pieces;
    for (std::size_t at = 0; at < std::max(one.size(), other.size()); at += kDatagramPackets) {
        for (const Pieces* const from : {&one, &other}) {
            const std::size_t begin = std::min(at, from->size());
            const std::size_t end = std::min(at + kDatagramPackets, from->size());
            pieces.insert(pieces.end(), from->begin() + static_cast<std::ptrdiff_t>(begin),
                          from->begin() + static_cast<std::ptrdiff_t>(end));
        }
    }
    return pieces;
}

}  // namespace endtoend
