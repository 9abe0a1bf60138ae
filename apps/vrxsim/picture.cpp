#include "vrxsim/picture.h"

#include <algorithm>
#include <cmath>
#include <functional>
#include <iomanip>
#include <sstream>

namespace vrx::simulation {

namespace {

constexpr std::int64_t mostBins = 720;
constexpr int width = 960, left = 70, right = 20, plotWidth = width - left - right;
constexpr int plotHeight = 170, titleHeight = 56, panelHeight = plotHeight + 70;
constexpr int stepsOfPixel = 2;  // the heights of areas are whole steps

constexpr const char* colours[causeCount] = {"#3b82f6", "#f59e0b", "#a855f7", "#ec4899",
                                             "#10b981", "#0e7490", "#ef4444", "#9ca3af"};

constexpr const char* style =
    "text{font:12px "
    "sans-serif;fill:#57606a}.t{font-size:15px;font-weight:bold}.e{text-anchor:end}.m{text-anchor:middle}"
    ".g{stroke:#8b949e;stroke-opacity:.35}.a{stroke:#8b949e}"
    "@media(prefers-color-scheme:dark){text{fill:#b1bac4}}";

std::int64_t minutesOfBin(std::int64_t days) {
    for (const std::int64_t minutes : {1, 2, 5, 10, 15, 20, 30, 60, 120, 180, 360, 720})
        if (days * minutesOfDay <= mostBins * minutes) return minutes;
    return minutesOfDay;
}

// The next round number: 1, 2 or 5, and zeros.
double roundStep(double least) {
    const double power = std::pow(10, std::floor(std::log10(least)));
    for (const double digit : {1.0, 2.0, 5.0})
        if (digit * power >= least * (1 - 1e-9)) return digit * power;
    return 10 * power;
}

// With commas between the thousands.
std::string numberText(double number) {
    std::ostringstream stream;
    stream << std::setprecision(3) << number;
    if (number < 1000) return stream.str();
    std::string text = std::to_string(std::llround(number));
    for (std::size_t at = text.size(); at > 3; text.insert(at, ",")) at -= 3;
    return text;
}

// Requests a minute in each bin, of one cause.
std::vector<double> binned(const std::vector<std::uint32_t>& minutes, std::int64_t ofBin, std::int64_t bins,
                           double scale) {
    std::vector<double> sums(static_cast<std::size_t>(bins));
    for (std::size_t minute = 0; minute < minutes.size(); ++minute)
        sums[minute / static_cast<std::size_t>(ofBin)] += minutes[minute];
    for (double& sum : sums) sum *= scale / static_cast<double>(ofBin);
    return sums;
}

class Panel {
public:
    Panel(const Counts& counts, std::int64_t days, std::uint64_t devicesOfLife)
        : days_(days), ofBin_(minutesOfBin(days)), bins_((days * minutesOfDay + ofBin_ - 1) / ofBin_) {
        std::vector<double> below(static_cast<std::size_t>(bins_));
        for (std::size_t cause = 0; cause < causeCount; ++cause) {
            const auto own = binned(counts.minutes[cause], ofBin_, bins_, static_cast<double>(devicesOfLife));
            std::ranges::transform(below, own, below.begin(), std::plus());
            tops_[cause] = below;
        }
        const double most = std::max(1e-9, *std::ranges::max_element(below));
        step_ = roundStep(most / 4);
        highest_ = step_ * std::ceil(most / step_);
    }

    std::string drawn(int top, const std::string& heading) const {
        std::ostringstream text;
        text << "<g transform='translate(" << left << ' ' << top << ")'><text y='-10'>" << heading << "</text>\n";
        drawScales(text);
        const double binWidth = static_cast<double>(plotWidth) / static_cast<double>(bins_);
        text << "<g transform='translate(0 " << plotHeight << ") scale(" << binWidth << ' ' << 1.0 / stepsOfPixel
             << ")'>\n";
        // From the uppermost down: each covers what is not its own of the one before.
        for (std::size_t cause = causeCount; cause-- > 0;)
            if (cause == 0 || tops_[cause] != tops_[cause - 1]) drawArea(text, tops_[cause], colours[cause]);
        text << "</g></g>\n";
        return text.str();
    }
    std::int64_t ofBin() const { return ofBin_; }

private:
    void drawScales(std::ostringstream& text) const {
        for (double value = 0; value <= highest_ * 1.001; value += step_) {
            const int y = plotHeight - static_cast<int>(std::lround(value / highest_ * plotHeight));
            text << "<path class='g' d='M0 " << y << "H" << plotWidth << "'/><text class='e' x='-8' y='" << y + 4
                 << "'>" << numberText(value) << "</text>\n";
        }
        const std::int64_t distance = days_ <= 12 ? 1 : days_ <= 60 ? 5 : 30;
        for (std::int64_t day = 0; day <= days_; day += distance) {
            const auto x = day * plotWidth / days_;
            text << "<path class='a' d='M" << x << ' ' << plotHeight << "v5'/><text class='m' x='" << x << "' y='"
                 << plotHeight + 18 << "'>" << (day == 0 ? "day 0" : std::to_string(day)) << "</text>\n";
        }
    }
    void drawArea(std::ostringstream& text, const std::vector<double>& tops, const char* colour) const {
        text << "<path fill='" << colour << "' d='M0 0";
        long height = 0;
        std::int64_t flat = 0;
        for (const double value : tops) {
            const long next = std::lround(value / highest_ * plotHeight * stepsOfPixel);
            if (next != height) {
                if (flat > 0) text << 'h' << flat;
                text << 'v' << height - next;
                flat = 0;
            }
            height = next;
            ++flat;
        }
        text << 'h' << flat << "V0z'/>\n";
    }

    const std::int64_t days_, ofBin_, bins_;
    std::array<std::vector<double>, causeCount> tops_;  // of what is drawn of the causes up to each
    double step_ = 1, highest_ = 1;
};

std::string legendOf(const Census& census) {
    std::ostringstream text;
    int x = left;
    for (std::size_t i = 0; i < causeCount; ++i) {
        const auto cause = static_cast<Cause>(i);
        if (std::ranges::none_of(census.servers, [cause](const Counts& counts) { return counts.total(cause) > 0; }))
            continue;
        text << "<rect x='" << x << "' y='34' width='11' height='11' fill='" << colours[i] << "'/><text x='" << x + 16
             << "' y='44'>" << describe(cause) << "</text>\n";
        x += 90;
    }
    return text.str();
}

}  // namespace

std::string pictureOf(const Census& census, std::int64_t days, std::uint64_t devicesOfLife, const std::string& title) {
    constexpr int height = titleHeight + static_cast<int>(serverCount) * panelHeight;
    std::ostringstream text;
    text << "<svg xmlns='http://www.w3.org/2000/svg' viewBox='0 0 " << width << ' ' << height
         << "' role='img'>\n<title>" << title << "</title><style>" << style << "</style>\n<text class='t' x='" << left
         << "' y='20'>" << title << "</text>\n"
         << legendOf(census);
    const char* const headings[] = {"Coverage server", "Version document"};
    int top = titleHeight + 30;
    for (std::size_t i = 0; i < serverCount; ++i, top += panelHeight) {
        const Panel panel(census.servers[i], days, devicesOfLife);
        const std::string bin = std::to_string(panel.ofBin());
        text << panel.drawn(
            top, std::string(headings[i]) + ": requests a minute, averaged over " + bin + " min; days in UTC");
    }
    text << "</svg>\n";
    return text.str();
}

}  // namespace vrx::simulation
