export const options = {
  'options.title': 'Options',
  'options.intro': 'Options of the file sharing service that have to do with the domain.',
  'options.loading': 'Loading the options…',
  'options.failed': 'The options can’t be shown as they are stored.',
  'options.enable_sync_time': 'Set the clock by the domain controller',
  'options.enable_sync_time.what':
    'The appliance takes over the controller’s time at once and then every hour. Logging in by Kerberos fails when the two clocks differ by more than five minutes.',
  'options.enable_server_signing': 'Sign connections when the client asks for it',
  'options.enable_server_signing.what':
    'File sharing connections of clients that ask for it are signed, so that nobody on the way can change them unnoticed.',
  'options.enable_rpc_enum_usergroup': 'Fetch users and groups by RPC',
  'options.enable_rpc_enum_usergroup.what':
    'Refreshes ask the way NT4-style domains are asked, also in Active Directory. Use it when the controller does not answer LDAP searches.',
  'options.disable_domain_admins': 'Keep the domain’s administrators out',
  'options.disable_domain_admins.what':
    'The administrators of the domain are not administrators of this appliance.',
  'options.domain_nested_group': 'Depth of groups within groups',
  'options.domain_nested_group.what':
    'How many levels of groups within groups are followed, 1 to 99. More takes longer in large domains.',
  'options.depth.problem': 'Enter a whole number from 1 to 99. Anything else would count as 1.',
  'options.elsewhere': 'Changed elsewhere meanwhile, and taken over here:',
  'options.elsewhere.item': '{option}: now {value}',
  'options.conflict.item': '{option}: stored elsewhere is {theirs}, entered here is {mine}',

  'form.changed': 'Changed',
  'form.stored': 'Stored: {value}',
  'form.changes': { one: '{count} change is not saved.', other: '{count} changes are not saved.' },
  'form.unchanged': 'Nothing is changed.',
  'form.saving': 'Saving…',
  'form.saved': 'Saved.',
  'form.restored': 'Your session had ended. What you had not saved is here again.',
  'form.failed': 'Not saved.',
  'form.invalid': 'Correct what is marked before saving.',
  'form.discard': 'Discard changes',
  'form.conflict': 'Something else was stored meanwhile',
  'form.conflict.first': 'Choose above what shall hold.',
  'form.conflict.mine': 'Keep what is entered here',
  'form.conflict.theirs': 'Load what is stored',
  'form.leave.title': 'Leave without saving?',
  'form.leave.body': 'What you have changed in this form is not saved yet.',
  'form.leave.stay': 'Stay here',
  'form.leave.go': 'Leave and discard the changes',
} as const;
