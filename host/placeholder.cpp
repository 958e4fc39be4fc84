// Placeholder until the AudioTrack stand-in lands.
