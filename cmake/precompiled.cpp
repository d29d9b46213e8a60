// Owns the precompiled headers, which all targets share; holds nothing itself.
