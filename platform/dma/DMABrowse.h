// A ContentDirectory:1 Browse request: what to browse and where.
#pragma once

#include <string>

enum DMAGENT_BROWSETYPES {
    BrowseMetadata = 0,
    BrowseDirectChildren = 1,
};

class DMABrowse {
  public:
    DMABrowse(DMAGENT_BROWSETYPES type, std::string controlUrl);
    virtual ~DMABrowse();

    // Checks the request: non-zero when the control URL is not an absolute http:// URL or the
    // object id is empty (or the browse type is unknown); 0 when it is ready to be sent.
    // DMAParser::Parse builds each page's SOAP envelope from the members as they are then.
    virtual int Prepare();

    std::string objectId;
    std::string filter = "*";
    unsigned int startingIndex = 0;
    unsigned int requestedCount = 0;  // 0: every object (the parser pages as needed)
    std::string sortCriteria;

    DMAGENT_BROWSETYPES Type() const { return type_; }
    const std::string& ControlUrl() const { return controlUrl_; }
    // "BrowseMetadata" or "BrowseDirectChildren".
    const char* BrowseFlag() const;
    // True after a successful Prepare.
    bool IsPrepared() const { return prepared_; }

  private:
    DMAGENT_BROWSETYPES type_;
    std::string controlUrl_;
    bool prepared_ = false;
};
