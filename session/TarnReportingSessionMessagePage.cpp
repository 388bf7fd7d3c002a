// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionMessagePage.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>
#include <string_view>
#include <utility>

#include "plist/Key.h"
#include "service/vocabulary/TarnReportingLog.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSessionMessagePage"};

constexpr std::uint8_t kRedundant = 1;
constexpr std::uint8_t kSessionStarted = 2;
// Of a page; a client that has more of them within a few hundred messages doesn't make pages larger.
constexpr std::size_t kMostKinds = 64;

// Sees what a disk did to the bytes. It is the same for as long as the process runs, as a page is.
std::uint64_t checksum(std::string_view bytes) noexcept {
  return plist::Key::hashOf(bytes);
}

bool readRecord(plist::PackedImageReader& reader,
                const std::vector<TarnReportingSessionMessage::DestinationWorkers>& destinations,
                TarnReportingSessionMessagePage::Record& record) {
  AudioEventCategory category;
  AudioEventType type;
  std::uint8_t flags;
  std::uint32_t destination;
  plist::Dictionary payload;
  const bool isWhole = reader.readNumber(category) && reader.readNumber(type) && reader.readNumber(flags) &&
                       reader.readNumber(destination) && destination <= destinations.size() && reader.read(payload);
  if (!isWhole) return false;
  record = std::make_shared<TarnReportingSessionMessage>(std::move(payload), category, type);
  record->setIsRedundant((flags & kRedundant) != 0);
  record->setIsSessionStarted((flags & kSessionStarted) != 0);
  if (destination > 0) {
    record->setDestinationWorkers(destinations[destination - 1]);
  }
  return true;
}

}  // namespace

void TarnReportingSessionMessagePage::Maker::add(const TarnReportingSessionMessage& record) {
  const double time = record.sortingTime();
  if (contents_.records++ == 0) {
    contents_.earliest = contents_.latest = time;
  } else {
    contents_.isSorted = contents_.isSorted && lastTime_ <= time;
    contents_.earliest = std::min(contents_.earliest, time);
    contents_.latest = std::max(contents_.latest, time);
  }
  lastTime_ = time;
  noteKind(record.kind());
  const int flags = (record.isRedundant() ? kRedundant : 0) | (record.isSessionStarted() ? kSessionStarted : 0);
  writer_.writeNumber(record.category());
  writer_.writeNumber(record.type());
  writer_.writeNumber(static_cast<std::uint8_t>(flags));
  writer_.writeNumber(static_cast<std::uint32_t>(numberOf(record.destinationWorkers())));
  writer_.write(record.message());
}

void TarnReportingSessionMessagePage::Maker::noteKind(TarnReportingSessionMessage::Kind kind) {
  std::vector<TarnReportingSessionMessage::Kind>& kinds = contents_.kinds;
  if (contents_.mayHave([kind](TarnReportingSessionMessage::Kind each) { return each == kind; })) return;
  if (kinds.size() == kMostKinds) {
    contents_.hasManyKinds = true;
    kinds = {};
    return;
  }
  kinds.push_back(kind);
}

// Messages go to few sets of workers, whose names are static texts: they needn't be written.
std::size_t TarnReportingSessionMessagePage::Maker::numberOf(
    const TarnReportingSessionMessage::DestinationWorkers& destinations) {
  if (destinations.empty()) return 0;
  const auto found = std::find(destinations_.begin(), destinations_.end(), destinations);
  const auto number = static_cast<std::size_t>(found - destinations_.begin()) + 1;
  if (found == destinations_.end()) {
    destinations_.push_back(destinations);
  }
  return number;
}

Result<std::shared_ptr<const TarnReportingSessionMessagePage>> TarnReportingSessionMessagePage::Maker::finish(
    platform::OverflowStore& store, const std::shared_ptr<Counts>& counts) {
  writer_.writeNumber(checksum(image_));
  const auto page = makePage(counts);  // first, so that what lies in the store has somebody who removes it
  Result<platform::OverflowStore::Place> written = store.write(image_);
  if (written.failed()) return {nullptr, std::move(written.error)};
  page->store_ = &store;
  page->place_ = written.value;
  page->storedBytes_ = image_.size();
  counts->bytesInStore += page->storedBytes_;
  std::string().swap(image_);  // an assignment would keep the room, and the page with it
  fill(*page);
  return {page, {}};
}

std::shared_ptr<const TarnReportingSessionMessagePage> TarnReportingSessionMessagePage::Maker::finishInMemory(
    const std::shared_ptr<Counts>& counts) {
  const auto page = makePage(counts);
  fill(*page);
  return page;
}

std::shared_ptr<TarnReportingSessionMessagePage> TarnReportingSessionMessagePage::Maker::makePage(
    const std::shared_ptr<Counts>& counts) {
  struct Constructible : TarnReportingSessionMessagePage {
    Constructible() {}  // NOLINT(modernize-use-equals-default): reaches the private one
  };
  const std::shared_ptr<TarnReportingSessionMessagePage> page = std::make_shared<Constructible>();
  page->counts_ = counts;
  return page;
}

void TarnReportingSessionMessagePage::Maker::fill(TarnReportingSessionMessagePage& page) noexcept {
  page.image_ = std::move(image_);
  page.counts_->bytesInMemory += page.image_.size();
  page.destinations_ = std::move(destinations_);
  page.contents_ = std::move(contents_);
}

TarnReportingSessionMessagePage::~TarnReportingSessionMessagePage() {
  counts_->bytesInMemory -= image_.size();
  if (store_ == nullptr) return;
  store_->remove(place_);
  counts_->bytesInStore -= storedBytes_;
}

std::vector<TarnReportingSessionMessagePage::Record> TarnReportingSessionMessagePage::read() const {
  Result<std::vector<Record>> records = tryToRead();
  if (records.failed()) {
    records = tryToRead();  // a fault may have been the moment's
  }
  if (records.failed()) {
    counts_->recordsLost += size();
    kLog(LogLevel::Error, "%lu messages of a log can't be read back: %@", size(), records.error->text);
  }
  return std::move(records.value);
}

Result<std::vector<TarnReportingSessionMessagePage::Record>> TarnReportingSessionMessagePage::tryToRead() const {
  Result<std::string> stored;
  if (store_ != nullptr) {
    stored = store_->read(place_);
    if (stored.failed()) return {{}, std::move(stored.error)};
  }
  std::string_view image = store_ != nullptr ? std::string_view(stored.value) : std::string_view(image_);
  std::uint64_t expected;
  if (image.size() < sizeof expected) return {{}, Error{.text = "the page is cut"}};
  std::memcpy(&expected, image.data() + image.size() - sizeof expected, sizeof expected);
  image.remove_suffix(sizeof expected);
  if (checksum(image) != expected) return {{}, Error{.text = "the page is damaged"}};
  plist::PackedImageReader reader(image);
  std::vector<Record> records(size());
  for (Record& record : records) {
    if (!readRecord(reader, destinations_, record)) return {{}, Error{.text = "the page is damaged"}};
  }
  return {std::move(records), {}};
}

}  // namespace tarn
