#include "platform/dma/DMABrowse.h"

#include "platform/dma/SoapBrowse.h"

DMABrowse::DMABrowse(DMAGENT_BROWSETYPES type, std::string controlUrl)
    : type_(type), controlUrl_(std::move(controlUrl)) {}

DMABrowse::~DMABrowse() = default;

const char* DMABrowse::BrowseFlag() const {
    return type_ == BrowseMetadata ? "BrowseMetadata" : "BrowseDirectChildren";
}

int DMABrowse::Prepare() {
    prepared_ = false;
    if (type_ != BrowseMetadata && type_ != BrowseDirectChildren)
        return 1;
    if (!harmona::dma::IsAbsoluteHttpUrl(controlUrl_) || objectId.empty())
        return 1;
    prepared_ = true;
    return 0;
}
