#pragma once

#include "Host/Surface.h"
#include "Platform/ReportDescriptor.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Host {

/// Which HID devices are touch surfaces: those whose report descriptor declares the reports of
/// kReports on a vendor's usage page, and those that are named by their ids, whatever they declare.
class SurfaceMatch {
public:
    /// A vendor and a product id.
    struct Ids {
        std::uint16_t vendor = 0;
        std::uint16_t product = 0;

        /// "5658:5454", hexadecimal, one to four digits each. Throws std::invalid_argument with
        /// what is wrong with the text.
        static Ids fromText(std::string_view text);

        friend bool operator==(const Ids&, const Ids&) = default;
    };

    /// A report that a surface must have, with at least so many bytes after its id.
    struct Report {
        Vexa::ReportKind kind;
        std::uint8_t id;
        std::size_t bytes;
    };
    static constexpr std::array<Report, 5> kReports = {{
        {Vexa::ReportKind::Input, 1, 72},
        {Vexa::ReportKind::Input, 2, 9},
        {Vexa::ReportKind::Feature, 4, 2},
        {Vexa::ReportKind::Feature, 31, 4},
        {Vexa::ReportKind::Feature, 63, 4},
    }};

    /// By the descriptor alone.
    SurfaceMatch() = default;
    /// By the descriptor, or named.
    explicit SurfaceMatch(std::vector<Ids> named) : named_(std::move(named)) {}
    /// Every HID device.
    static SurfaceMatch everything();

    [[nodiscard]] bool matches(const Surface& surface) const;
    /// Why the device is one, or why it is not, in one line: "its reports are a surface's", "named
    /// 5658:5454", "no input report 2; feature report 4 has 1 byte after its id, not 2".
    [[nodiscard]] std::string reason(const Surface& surface) const;

private:
    [[nodiscard]] bool isNamed(const Surface& surface) const;

    std::vector<Ids> named_;
    bool everything_ = false;
};

}  // namespace VexaTouch::Host
