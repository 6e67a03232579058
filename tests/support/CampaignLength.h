// How long a campaign runs: its short form is a test like any other, its long form is asked for by
// the environment variable ZMC_CAMPAIGN=full.
#ifndef ZMC_TESTS_SUPPORT_CAMPAIGNLENGTH_H
#define ZMC_TESTS_SUPPORT_CAMPAIGNLENGTH_H

#include <cstdlib>
#include <string_view>

namespace zmctest {

inline bool IsFullCampaign() {
    const char* const form = std::getenv("ZMC_CAMPAIGN");
    return form && std::string_view(form) == "full";
}

template <class Length>
Length CampaignLength(Length shortForm, Length fullForm) {
    return IsFullCampaign() ? fullForm : shortForm;
}

}  // namespace zmctest

#endif
