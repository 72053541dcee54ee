// A list whose links lie in its elements, so that nothing is allocated to be on it. An element is on one list at most
// and leaves it when it ends. The owner of the list sees to locking.
#pragma once

namespace quorvel::platform::host {

class ListLink {
 public:
  ListLink() noexcept = default;
  ListLink(const ListLink&) = delete;
  ListLink& operator=(const ListLink&) = delete;
  ~ListLink() { unlink(); }

  void unlink() noexcept {
    previous_->next_ = next_;
    next_->previous_ = previous_;
    previous_ = next_ = this;
  }

 private:
  template <typename Element>
  friend class IntrusiveList;

  ListLink* previous_ = this;
  ListLink* next_ = this;
};

/// `Element` derives from ListLink.
template <typename Element>
class IntrusiveList {
 public:
  [[nodiscard]] bool empty() const noexcept { return head_.next_ == &head_; }
  /// The first element and the one after `element`, or null.
  [[nodiscard]] Element* front() const noexcept { return element_at(head_.next_); }
  [[nodiscard]] Element* after(const Element* element) const noexcept {
    return element_at(static_cast<const ListLink*>(element)->next_);
  }
  /// Puts `element` at the end, from wherever it was.
  void push_back(Element* added) noexcept {
    ListLink* element = added;
    element->unlink();
    element->previous_ = head_.previous_;
    element->next_ = &head_;
    head_.previous_->next_ = element;
    head_.previous_ = element;
  }
  /// Takes over all elements of `other`, in their order.
  void take_all(IntrusiveList& other) noexcept {
    while (Element* element = other.front()) push_back(element);
  }

 private:
  [[nodiscard]] Element* element_at(ListLink* link) const noexcept {
    return link == &head_ ? nullptr : static_cast<Element*>(link);
  }

  ListLink head_;
};

}  // namespace quorvel::platform::host
