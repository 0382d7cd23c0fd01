/// @file
/// ZelPref conversion policies: strategy objects that turn property values into
/// text and back, used to write plain values into documents. The stock
/// policies cover numbers, integers, flags and text; hosts add their own.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>

#include <cstddef>
#include <exception>

namespace ZelPref {

namespace Detail {

/// Thrown when a value cannot be turned into text or a text into a value.
class ZEL_API BadConversion : public std::exception {
public:
  BadConversion() = default;
  /// The class's name; the exception carries nothing about the value.
  const char* what() const noexcept override;
};

} // namespace Detail

/// Turns values of one kind into text and back.
class ZEL_API ConversionPolicy {
public:
  virtual ~ConversionPolicy();
  ConversionPolicy(const ConversionPolicy&) = delete;
  ConversionPolicy& operator=(const ConversionPolicy&) = delete;

  /// The text form of `value`; throws Detail::BadConversion when `value` does
  /// not hold the policy's kind or has no text form.
  virtual ZelStringT<char16_t> ToText(const ZelUtils::Any& value) const = 0;
  /// The value that `text` stands for; throws Detail::BadConversion when the
  /// text is not a valid form of the policy's kind.
  virtual ZelUtils::Any FromText(const ZelStringT<char16_t>& text) const = 0;

protected:
  ConversionPolicy() = default;
};

/// Values held as double. Writes the shortest text that reads back to the same
/// number ("0.5", "12", "1e+21"); reads decimal and exponent forms with an
/// optional sign and surrounding ASCII white space. Infinities and NaN have no
/// text form.
class ZEL_API NumberConversionPolicy final : public ConversionPolicy {
public:
  /// Room enough for the text of any number.
  static constexpr std::size_t kMaxTextLength = 32;

  NumberConversionPolicy() = default;
  ~NumberConversionPolicy() override;
  ZelStringT<char16_t> ToText(const ZelUtils::Any& value) const override;
  ZelUtils::Any FromText(const ZelStringT<char16_t>& text) const override;
  /// Writes the text ToText gives for `number`, which must be finite, into
  /// `out` (room for kMaxTextLength units) and returns the end of it, so that
  /// a writer can take the text without a string being made.
  static char16_t* WriteText(double number, char16_t* out) noexcept;
};

/// Values held as int. Reads any number form whose value is a whole number in
/// the range of int ("12", "-3", "1e3", "2.0"); rejects fractions.
class ZEL_API IntegerConversionPolicy final : public ConversionPolicy {
public:
  IntegerConversionPolicy() = default;
  ~IntegerConversionPolicy() override;
  ZelStringT<char16_t> ToText(const ZelUtils::Any& value) const override;
  ZelUtils::Any FromText(const ZelStringT<char16_t>& text) const override;
};

/// Values held as bool. Writes "1" and "0"; reads "1", "0", "true" and "false"
/// (letter case ignored, surrounding ASCII white space allowed).
class ZEL_API BooleanConversionPolicy final : public ConversionPolicy {
public:
  BooleanConversionPolicy() = default;
  ~BooleanConversionPolicy() override;
  ZelStringT<char16_t> ToText(const ZelUtils::Any& value) const override;
  ZelUtils::Any FromText(const ZelStringT<char16_t>& text) const override;
};

/// Values held as ZelStringT<char16_t>, written and read unchanged.
class ZEL_API TextConversionPolicy final : public ConversionPolicy {
public:
  TextConversionPolicy() = default;
  ~TextConversionPolicy() override;
  ZelStringT<char16_t> ToText(const ZelUtils::Any& value) const override;
  ZelUtils::Any FromText(const ZelStringT<char16_t>& text) const override;
};

} // namespace ZelPref
