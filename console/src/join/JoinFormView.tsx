import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { ExpandableSection } from '@patternfly/react-core/dist/esm/components/ExpandableSection';
import { Form } from '@patternfly/react-core/dist/esm/components/Form';
import type { NetworkInterface } from '../api/types';
import { t } from '../texts';
import { AdvancedFields } from './AdvancedFields';
import { Failure } from './Failure';
import type { Job } from './job';
import { JoinFields, type FieldsProps } from './JoinFields';
import { advancedCount } from './rules';

interface JoinFormViewProps extends FieldsProps {
  id: string;
  // How often the form was sent with something wrong in it.
  attempts: number;
  // The domain that the appliance is a member of, or null.
  member: string | null;
  interfaces: NetworkInterface[] | undefined;
  unfolded: boolean;
  onUnfold: (unfolded: boolean) => void;
  onSubmit: () => void;
  failure: Extract<Job, { state: 'failed' }> | null;
  // The session had ended, and what was entered before is in the form again.
  restored: boolean;
}

// The dialog's form, with what went wrong with the attempt before.
export function JoinFormView(props: JoinFormViewProps) {
  const { form, problems, insist, attempts, member, unfolded, failure } = props;
  const wrong = Object.keys(problems).length;
  const set = advancedCount(form);
  return (
    <Form
      id={props.id}
      isHorizontal
      noValidate
      autoComplete="off"
      onSubmit={(event) => {
        event.preventDefault();
        props.onSubmit();
      }}
    >
      {failure !== null && <Failure key={String(failure.record?.id)} job={failure} />}
      {props.restored && (
        <div role="status">
          <Alert isInline isPlain variant="info" component="p" title={t('join.restored')} />
        </div>
      )}
      {failure === null && member !== null && (
        <Alert
          isInline
          isPlain
          variant="info"
          component="p"
          title={t('join.againHint', { domain: member })}
        />
      )}
      <div role="alert" className="vorn-summary">
        {insist && wrong > 0 && (
          <Alert
            key={attempts}
            isInline
            isPlain
            variant="danger"
            component="p"
            title={t('join.check.summary', { count: wrong })}
          />
        )}
      </div>
      <JoinFields {...props} />
      <ExpandableSection
        toggleText={set > 0 ? t('join.advanced.set', { count: set }) : t('join.advanced')}
        isExpanded={unfolded}
        onToggle={(_event, open) => props.onUnfold(open)}
      >
        <p className="vorn-advanced__hint">{t('join.advanced.hint')}</p>
        <div className="vorn-advanced pf-v6-c-form pf-m-horizontal">
          <AdvancedFields {...props} />
        </div>
      </ExpandableSection>
    </Form>
  );
}
