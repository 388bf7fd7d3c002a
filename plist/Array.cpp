// SPDX-License-Identifier: Apache-2.0
#include <cstring>

#include "plist/Dictionary.h"
#include "plist/Packed.h"

namespace tarn::plist {

namespace detail {

void releaseArrayBody(Body* body) noexcept {
  if (body == nullptr || body->references.fetch_sub(1, std::memory_order_acq_rel) != 1) return;
  if (body->holdsContainers != 0) {
    releaseContainers(body->data(), body->end());
  }
  freeBody(body);
}

}  // namespace detail

Array::Array(std::initializer_list<ValueView> items) : body_(nullptr) {
  for (const ValueView& item : items) {
    append(item);
  }
}

Array::Array(const Array& other) noexcept : body_(other.body_) {
  detail::retainBody(body_);
}

Array& Array::operator=(Array other) noexcept {
  std::swap(body_, other.body_);
  return *this;
}

Array::~Array() {
  detail::releaseArrayBody(body_);
}

std::size_t Array::size() const noexcept {
  return body_ == nullptr ? 0 : static_cast<std::size_t>(body_->count);
}

ValueView Array::operator[](std::size_t index) const noexcept {
  if (index >= size()) return {};
  const std::byte* at = body_->data();
  for (; index > 0; --index) {
    at += Packed::sizeAt(at);
  }
  return Packed::read(at);
}

void Array::append(const ValueView& value) {
  const std::size_t added = Packed::sizeOf(value);
  if (added == 0) return;
  const Array before = *this;  // keeps what `value` may look into, and makes this block a shared one
  const std::size_t old = body_ == nullptr ? 0 : body_->bytes;
  detail::Body* body = detail::makeBody(old + added);
  if (old > 0) {
    std::memcpy(body->data(), body_->data(), old);
    if (body_->holdsContainers != 0) {
      detail::retainContainers(body_->data(), body_->end());
    }
  }
  Packed::write(body->data() + old, value);
  body->count = size() + 1;
  const bool containers = value.kind() == Kind::Array || value.kind() == Kind::Dictionary;
  body->holdsContainers = containers || (body_ != nullptr && body_->holdsContainers != 0) ? 1 : 0;
  *this = Array(body);
}

Array::Iterator Array::begin() const noexcept {
  Iterator iterator;
  iterator.at_ = body_ == nullptr ? nullptr : body_->data();
  return iterator;
}

Array::Iterator Array::end() const noexcept {
  Iterator iterator;
  iterator.at_ = body_ == nullptr ? nullptr : body_->end();
  return iterator;
}

ValueView Array::Iterator::operator*() const noexcept {
  return Packed::read(at_);
}

Array::Iterator& Array::Iterator::operator++() noexcept {
  at_ += Packed::sizeAt(at_);
  return *this;
}

}  // namespace tarn::plist
