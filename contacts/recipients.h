// The hand-over of recipients to the Write SMS view: the contact views build "name<number>;\r\n"
// pieces and give them to whichever view implements this (the Write SMS view appends a
// non-empty text to the recipients already in its field).
#pragma once

#include <string>

namespace vqm {

class RecipientsReceiver {
  public:
    virtual ~RecipientsReceiver() = default;
    virtual void AppendRecipients(const std::u16string& recipients) = 0;
};

}  // namespace vqm
