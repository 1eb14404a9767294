// Registration of the plugin's classes and global methods with the host.
#ifndef TINTWELL_PLUGIN_REGISTRATION_H
#define TINTWELL_PLUGIN_REGISTRATION_H

// Registers the classes, then the global methods, each in its fixed order.
void RegisterClasses();
void RegisterGlobalMethods();

#endif
