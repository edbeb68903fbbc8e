#include "streams.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <numeric>
#include <random>
#include <string>
#include <type_traits>
#include <utility>

#include "filler.h"
#include "messages.h"

namespace ironmoat::bench {

namespace {

using Payload = VeskCorvelProtocolPayload;
using Keys = Payload::CodingKeys;
using Choice = std::array<double, Keys::count>;  // probability of each field, in table order

/// Random numbers that are the same on every machine, unlike those of the standard's distributions.
class Chance {
 public:
  explicit Chance(std::uint64_t seed) : engine_(seed) {}
  std::uint64_t bits() { return engine_(); }
  std::size_t below(std::size_t limit) { return engine_() % limit; }
  /// Above 0, at most 1.
  double share() { return (static_cast<double>(engine_() >> 11) + 1) * 0x1p-53; }

 private:
  std::mt19937_64 engine_;
};

struct SteadyFiller : Filler {
  SteadyFiller(std::uint64_t number, Chance&) : Filler(number) {}
};

class VaryingFiller : public Filler {
 public:
  VaryingFiller(std::uint64_t number, Chance& chance) : Filler(number), chance_(chance) {}

 protected:
  /// Half of the lengths are at most 14 bytes, one in a hundred exceeds 300.
  std::size_t length(std::size_t) override {
    return static_cast<std::size_t>(std::min(8 * std::pow(chance_.share(), -1 / 1.25), 4000.0));
  }
  std::int64_t integer(std::int64_t) override {
    return static_cast<std::int64_t>(chance_.bits() >> (1 + chance_.below(62)));
  }

 private:
  Chance& chance_;
};

using Fields = std::remove_const_t<decltype(records::Table<Payload>::rows)>::Fields<Payload>;

Choice typicalFields() {
  const Payload typical = typicalPayload(0);
  Choice choice{};
  std::size_t place = 0;
  Fields::forEach([&](auto field) {
    if constexpr (requires { field.in(typical).has_value(); }) {
      choice[place] = field.in(typical).has_value() ? 1 : 0;
    }
    ++place;
  });
  return choice;
}

std::vector<std::size_t> placesInAnyOrder(Chance& chance) {
  std::vector<std::size_t> places(Keys::count);
  std::iota(places.begin(), places.end(), std::size_t{0});
  for (std::size_t i = places.size(); i > 1; --i) std::swap(places[i - 1], places[chance.below(i)]);
  return places;
}

/// The typical fields are likely; all others are rarer, each by its place in a fixed shuffle.
Choice byFrequency() {
  Choice choice = typicalFields();
  Chance chance(1);
  double rank = 0;
  for (const std::size_t place : placesInAnyOrder(chance)) {
    choice[place] = choice[place] == 0 ? 1.2 / (3 + ++rank) : 0.75;
  }
  return choice;
}

std::vector<Choice> tenChoices() {
  std::vector<Choice> choices(10);
  Chance chance(2);
  for (Choice& choice : choices) {
    const std::vector<std::size_t> places = placesInAnyOrder(chance);
    for (std::size_t i = 0; i < 16; ++i) choice[places[i]] = 1;
  }
  return choices;
}

template <class SomeFiller>
std::vector<Payload> payloads(std::size_t count, const std::vector<Choice>& choices) {
  Chance chance(3);
  std::vector<Payload> records(count);
  for (std::size_t i = 0; i < count; ++i) {
    const Choice& choice = choices[chance.below(choices.size())];
    SomeFiller filler(1000 * i, chance);
    filler.fill(records[i], [&](std::size_t place) { return chance.share() <= choice[place]; });
  }
  return records;
}

Payload deep() {
  constexpr int kPayloads = 200;
  Payload inner;
  for (int i = 0; i < kPayloads; ++i) {
    Payload outer;
    outer.command = 1000 + i;
    outer.messageId = String(hex(8, static_cast<std::uint64_t>(i)));
    if (i > 0) outer.dstIdTokenList = List<Payload>{std::move(inner)};
    inner = std::move(outer);
  }
  return inner;
}

/// A record with its keys in another order and with unknown keys added.
struct Mixed {
  const Payload& record;
  const std::vector<std::size_t>& places;
  std::size_t unknownKeys;

  void encode(plist::Encoder& encoder) const {
    auto container = encoder.container<Keys>();
    for (const std::size_t wanted : places) {
      std::size_t place = 0;
      Fields::forEach([&](auto field) {
        if (place++ != wanted) return;
        if constexpr (requires { field.in(record).has_value(); }) {
          container.encodeIfPresent(field.in(record), Keys::at(wanted));
        } else {
          container.encode(field.in(record), Keys::at(wanted));
        }
      });
    }
    for (std::size_t i = 0; i < unknownKeys; ++i) {
      encoder.builder().string("unknown" + std::to_string(i));
      encoder.builder().integer(static_cast<std::int64_t>(i));
    }
  }
};

Data withoutLines(const Data& xml) {
  std::string text(xml.view());
  std::erase_if(text, [](char c) { return c == '\n' || c == '\t'; });
  return inOneThreadBlock(text);
}

}  // namespace

std::vector<Stream> streams(std::size_t count) {
  const std::vector<Choice> typical{typicalFields()};
  const std::vector<Choice> some{byFrequency()};
  return {
      {"lengths", payloads<VaryingFiller>(count, typical)},
      {"kinds", payloads<SteadyFiller>(count, tenChoices())},
      {"some", payloads<SteadyFiller>(count, some)},
      {"order", payloads<SteadyFiller>(count, typical), true},
      {"varied", payloads<VaryingFiller>(count, some), true},
      {"deep", {deep()}, false, 0, true},
      {"unknown", {typicalPayload(0)}, false, 3300},
  };
}

std::vector<Data> messagesOf(const Stream& stream, plist::Format form) {
  Chance chance(4);
  std::vector<std::size_t> places(Keys::count);
  std::iota(places.begin(), places.end(), std::size_t{0});
  std::vector<Data> messages;
  for (const Payload& record : stream.records) {
    if (stream.anyOrder) places = placesInAnyOrder(chance);
    const Data message = messageOf(Mixed{record, places, stream.unknownKeys}, form);
    messages.push_back(stream.compact && form == plist::Format::xml ? withoutLines(message)
                                                                    : message);
  }
  return messages;
}

}  // namespace ironmoat::bench
