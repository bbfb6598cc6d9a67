import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { Checkbox } from '@patternfly/react-core/dist/esm/components/Checkbox';
import { Form, FormGroup, FormHelperText } from '@patternfly/react-core/dist/esm/components/Form';
import { HelperText, HelperTextItem } from '@patternfly/react-core/dist/esm/components/HelperText';
import { TextInput } from '@patternfly/react-core/dist/esm/components/TextInput';
import { useEffect, useState, type FormEvent } from 'react';
import { call } from '../api/client';
import { useRestored, useUnsaved } from '../api/unsaved';
import { changedOptions, parseDepth, SWITCHES, type DomainOptions, type OptionName } from '../rules/options';
import { t } from '../texts';
import { ErrorAlert, useCall } from '../ui';
import { discarded, draftOf, merged, wantedOf, type Draft } from './draft';
import { Changed, Conflict, Outcome, SaveBar } from './FormParts';
import { LeaveGuard } from './LeaveGuard';

function valueText(options: DomainOptions, name: OptionName): string {
  const value = options[name];
  return typeof value === 'number' ? String(value) : value ? t('common.on') : t('common.off');
}

interface OptionsFormProps {
  stored: DomainOptions;
  // What is stored was read anew.
  onStored: (options: DomainOptions) => void;
}

export function OptionsForm({ stored, onStored }: OptionsFormProps) {
  const kept = useRestored<Draft>('options');
  const [draft, setDraft] = useState<Draft>(() => kept ?? draftOf(stored));
  const [restored, setRestored] = useState(kept !== undefined);
  const [saved, setSaved] = useState(false);

  // Another window, another administrator or the command line has changed something.
  useEffect(() => setDraft((before) => merged(before, stored)), [stored]);

  const save = useCall(async (wanted: DomainOptions) => {
    const now = await call('conf.get', {});
    const next = merged(draft, now);
    onStored(now);
    setDraft(next);
    if (next.conflicts.length > 0) return;
    const changes = changedOptions(now, wantedOf(next) ?? wanted);
    if (Object.keys(changes).length > 0) await call('conf.set', changes);
    const after = await call('conf.get', {});
    onStored(after);
    setDraft((before) => ({ ...discarded(after), elsewhere: before.elsewhere }));
    setSaved(true);
  });

  const wanted = wantedOf(draft);
  const depth = parseDepth(draft.depth);
  const badDepth = depth === null;
  const changes = wanted === null ? {} : changedOptions(draft.base, wanted);
  const depthChanged = badDepth || depth !== draft.base.domain_nested_group;
  const count =
    SWITCHES.filter((name) => draft.switches[name] !== draft.base[name]).length + (depthChanged ? 1 : 0);
  const ready = wanted !== null && Object.keys(changes).length > 0 && draft.conflicts.length === 0;

  useUnsaved('options', count > 0 ? draft : null);

  const edit = (change: (before: Draft) => Draft) => {
    setSaved(false);
    setRestored(false);
    save.reset();
    setDraft((before) => ({ ...change(before), elsewhere: [] }));
  };
  const submit = (event: FormEvent) => {
    event.preventDefault();
    setSaved(false);
    setRestored(false);
    if (ready && !save.busy) void save.run(wanted);
  };

  return (
    <>
      <LeaveGuard dirty={count > 0} />
      <Outcome saved={saved} restored={restored}>
        {draft.elsewhere.length > 0 && (
          <Alert isInline variant="info" component="p" title={t('options.elsewhere')}>
            <ul>
              {draft.elsewhere.map((name) => (
                <li key={name}>
                  {t('options.elsewhere.item', {
                    option: t(`options.${name}`),
                    value: valueText(draft.base, name),
                  })}
                </li>
              ))}
            </ul>
          </Alert>
        )}
      </Outcome>
      {draft.conflicts.length > 0 && (
        <Conflict
          title={t('form.conflict')}
          body={
            <ul>
              {draft.conflicts.map((name) => (
                <li key={name}>
                  {t('options.conflict.item', {
                    option: t(`options.${name}`),
                    theirs: valueText(draft.base, name),
                    mine: name === 'domain_nested_group' ? draft.depth : '',
                  })}
                </li>
              ))}
            </ul>
          }
          onMine={() => edit((before) => ({ ...before, conflicts: [] }))}
          onTheirs={() => edit((before) => discarded(before.base))}
        />
      )}
      {save.error !== undefined && <ErrorAlert error={save.error} title={t('form.failed')} />}
      <Form className="vorn-form" onSubmit={submit} aria-label={t('options.title')} noValidate>
        {SWITCHES.map((name) => {
          const changed = draft.switches[name] !== draft.base[name];
          return (
            <div key={name} className={changed ? 'vorn-form__field--changed' : undefined}>
              <Checkbox
                id={`option-${name}`}
                label={t(`options.${name}`)}
                description={t(`options.${name}.what`)}
                isChecked={draft.switches[name]}
                isDisabled={save.busy}
                onChange={(_event, checked) =>
                  edit((before) => ({ ...before, switches: { ...before.switches, [name]: checked } }))
                }
                body={changed ? <Changed stored={valueText(draft.base, name)} /> : undefined}
              />
            </div>
          );
        })}
        <FormGroup
          label={t('options.domain_nested_group')}
          fieldId="option-depth"
          className={depthChanged ? 'vorn-form__field--changed' : ''}
        >
          <TextInput
            id="option-depth"
            className="vorn-depth"
            inputMode="numeric"
            autoComplete="off"
            maxLength={6}
            value={draft.depth}
            validated={badDepth ? 'error' : 'default'}
            aria-describedby="option-depth-help"
            isDisabled={save.busy}
            onChange={(_event, text) => edit((before) => ({ ...before, depth: text }))}
          />
          <FormHelperText>
            <HelperText id="option-depth-help" aria-live="polite">
              <HelperTextItem>{t('options.domain_nested_group.what')}</HelperTextItem>
              {badDepth && <HelperTextItem variant="error">{t('options.depth.problem')}</HelperTextItem>}
            </HelperText>
          </FormHelperText>
          {depthChanged && <Changed stored={valueText(draft.base, 'domain_nested_group')} />}
        </FormGroup>
        <SaveBar
          changes={count}
          busy={save.busy}
          problem={
            badDepth ? t('form.invalid') : draft.conflicts.length > 0 ? t('form.conflict.first') : undefined
          }
          onDiscard={() => edit((before) => discarded(before.base))}
        />
      </Form>
    </>
  );
}
