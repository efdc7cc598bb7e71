// The simulated card's short-message service: the SIM message memory with its capacity, the
// message format (PDU or text), the message centre and submit parameters, and the network side
// that delivers messages to the card and announces each with "+CMTI:".
#pragma once

#include <map>
#include <string>

#include "cardsim/command_set.h"

namespace vqm::cardsim {

inline constexpr int kDefaultSmsCapacity = 20;

class MessageMemory : public CommandSet {
  public:
    // <stat> of 27.005 PDU mode.
    enum Stat { RecUnread = 0, RecRead = 1, StoUnsent = 2, StoSent = 3 };
    struct Stored {
        int stat = RecUnread;
        std::string pdu;  // uppercase hexadecimal, centre address first
    };

    Handled Run(const std::string& upper, const std::string& original, std::string& info,
                std::string& errorText) override;
    bool Complete(const std::string& text, std::string& info, std::string& errorText) override;
    std::string Control(const std::string& command, const std::string& rest) override;
    std::string ControlHelp() const override;
    void Save(std::ostream& out) const override;
    bool Load(const std::string& name, const std::string& rest) override;
    void FillDemo() override;

    const std::map<int, Stored>& Messages() const { return messages_; }
    int Capacity() const { return capacity_; }
    const std::string& Centre() const { return centre_; }

  private:
    enum class Pending { None, WritePdu, SendPdu, WriteText, SendText };

    Handled Format(const std::string& args, bool query, std::string& info);
    Handled Memories(const std::string& args, bool query, bool test, std::string& info,
                     std::string& errorText);
    Handled ReadOne(const std::string& args, std::string& info, std::string& errorText);
    Handled List(const std::string& args, bool test, std::string& info, std::string& errorText);
    Handled Delete(const std::string& args, std::string& errorText);
    Handled SendStored(const std::string& args, std::string& info, std::string& errorText);
    Handled StartWrite(const std::string& args, bool send, std::string& errorText);
    Handled CentreCommand(const std::string& args, bool query, std::string& info);
    Handled Parameters(const std::string& args, bool query, std::string& info);

    // The information line(s) of one message in the current format.
    std::string Listing(const std::string& tag, int index, const Stored& message, bool withIndex);
    // First free location, 0 when the memory is full.
    int FreeIndex() const;
    // Stores a message that arrived from the network and announces it; "" or the refusal.
    std::string Deliver(const std::string& pdu);
    std::string SubmitFromText(const std::string& number, const std::string& text) const;
    void Change();

    std::map<int, Stored> messages_;
    int capacity_ = kDefaultSmsCapacity;
    int mode_ = 0;  // AT+CMGF: 0 PDU, 1 text
    std::string centre_;
    int centreType_ = 145;
    int firstOctet_ = 17, validity_ = 167, protocol_ = 0, coding_ = 0;  // AT+CSMP
    int nextReference_ = 0;
    int nextConcatReference_ = 0;  // the reference of a long delivery's parts
    Pending pending_ = Pending::None;
    int pendingLength_ = 0;
    int pendingStat_ = StoUnsent;
    std::string pendingNumber_;
};

}  // namespace vqm::cardsim
