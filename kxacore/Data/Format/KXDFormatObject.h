// File: KXDFormatObject.h
//
// KXDFormatObject is what a formatter is handed: a non-owning, type-erased
// reference to the value being formatted (a KXDDate, a KXDPlaceName, or any
// type of your own), in the way std::string_view refers to a string.
//
//   KXDDate date(1900, 3, 5);
//   formatter.stringForObject(date);                  // binds implicitly
//   if (const KXDDate* d = object.get<KXDDate>()) ...  // inside a formatter
//
// Why not a common base class: dates are plain values stored by the
// thousand; a virtual base would add a vtable pointer to each of them only
// so that formatters can tell them apart. The reference costs nothing and
// needs no change to the formatted types.
//
// get<T>() matches the exact type the reference was made from (no base or
// derived classes). Lifetime: the referenced value must outlive every use of
// the reference; formatters use it only for the length of one call, so a
// temporary argument is fine. Thread safety: a trivially copyable view.
#pragma once

#include <type_traits>
#include <typeinfo>

class KXDFormatObject {
 public:
  template <typename T,
            std::enable_if_t<!std::is_same_v<std::remove_cvref_t<T>, KXDFormatObject>, int> = 0>
  KXDFormatObject(const T& object) noexcept  // NOLINT: implicit by design, like string_view
      : object_(&object), type_(&typeid(T)) {
    static_assert(!std::is_pointer_v<T>, "pass the object, not a pointer to it");
  }

  // The referenced object when it is exactly a T, else nullptr.
  template <typename T>
  [[nodiscard]] const T* get() const noexcept {
    return *type_ == typeid(T) ? static_cast<const T*>(object_) : nullptr;
  }
  [[nodiscard]] const std::type_info& type() const noexcept { return *type_; }
  [[nodiscard]] const void* address() const noexcept { return object_; }

 private:
  const void* object_;
  const std::type_info* type_;
};
