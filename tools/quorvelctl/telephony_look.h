// A look at the telephony service, whose state holds some of the live answers.
#pragma once

namespace quorvel::tools {

/// Has live answers know what the telephony service tells at this moment: its first state, if it comes within 200
/// milliseconds from a service that the daemon would believe, or nothing.
void look_at_telephony();

}  // namespace quorvel::tools
